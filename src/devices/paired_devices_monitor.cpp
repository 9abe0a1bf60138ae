#include "vrx/devices/paired_devices_monitor.h"

#include <utility>

#include "vrx/platform/log.h"
#include "vrx/platform/notification_center.h"
#include "vrx/platform/platform.h"
#include "vrx/platform/process_lifecycle.h"
#include "vrx/platform/queue.h"
#include "vrx/platform/vendor.h"

namespace vrx {

using platform::Date;
using platform::Level;
using platform::Platform;

VRXPairedDevicesMonitor::VRXPairedDevicesMonitor(std::shared_ptr<VRXAgentProtocol> agent, Posts posts)
    : agent(std::move(agent)), posts_(std::move(posts)) {}

std::shared_ptr<VRXPairedDevicesMonitor> VRXPairedDevicesMonitor::initWithAgent(std::shared_ptr<VRXAgentProtocol> agent,
                                                                                Posts posts) {
    return std::shared_ptr<VRXPairedDevicesMonitor>(new VRXPairedDevicesMonitor(std::move(agent), std::move(posts)));
}

VRXPairedDevicesMonitor::~VRXPairedDevicesMonitor() {
    for (std::int32_t token : {pairNotifyToken, unpairNotifyToken})
        if (token != 0) Platform::current().notificationCenter().cancel(token);
}

void VRXPairedDevicesMonitor::start() {
    pairNotifyToken = listenFor(platform::devicePairedNotification);
    unpairNotifyToken = listenFor(platform::deviceUnpairedNotification);
}

std::int32_t VRXPairedDevicesMonitor::listenFor(std::string_view notification) {
    return Platform::current().notificationCenter().registerForNotification(
        platform::vendorIdentifier(notification), Platform::current().queues().mainQueue(),
        [monitor = weak_from_this()] {
            if (auto self = monitor.lock()) self->_pairedOrActiveDevicesDidChange(nullptr);
        });
}

void VRXPairedDevicesMonitor::_pairedOrActiveDevicesDidChange(std::nullptr_t /*notification*/) {
    log(Level::Default, "%s", "-[VRXPairedDevicesMonitor _pairedOrActiveDevicesDidChange:]");
    _updatePariedDevicesFollowUp();
}

// Keeps the process from ending before the reply: nothing would tell the next process of the change.
void VRXPairedDevicesMonitor::_updatePariedDevicesFollowUp() {
    auto work = Platform::current().processLifecycle().beginWork();
    auto schedulePost = [posts = posts_, work = std::move(work)](const DeviceInfoList& deviceInfos) {
        // "Devices followups" is spelled so on purpose.
        log(Level::Default, "Devices followups to be posted, if required, after paired device change");
        std::optional<Date> date = posts.nextDate(deviceInfos);
        if (!date) return;
        log(Level::Default,
            "Watch paired after phone's refreshActivity has already finished. Schedule followUp post for: %@", *date);
        posts.schedule(*date);
    };
    constexpr bool updateFollowUps = true;
    agent->getAllDeviceInfosUsingPolicy(VRXWarrantyLookupPolicyDefault, updateFollowUps, std::move(schedulePost));
}

}  // namespace vrx
