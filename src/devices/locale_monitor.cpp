#include "vrx/devices/locale_monitor.h"

#include <utility>

#include "vrx/platform/log.h"
#include "vrx/platform/notification_center.h"
#include "vrx/platform/platform.h"
#include "vrx/platform/process_lifecycle.h"
#include "vrx/platform/queue.h"
#include "vrx/platform/vendor.h"

namespace vrx {

using platform::Level;
using platform::Platform;

namespace {

constexpr platform::Duration settlingTime{5.0};

}  // namespace

VRXLocaleMonitor::VRXLocaleMonitor(std::shared_ptr<VRXAgentProtocol> agent, MakeFollowUp makeFollowUp)
    : agent(std::move(agent)), makeFollowUp_(std::move(makeFollowUp)) {}

std::shared_ptr<VRXLocaleMonitor> VRXLocaleMonitor::initWithAgent(std::shared_ptr<VRXAgentProtocol> agent,
                                                                  MakeFollowUp makeFollowUp) {
    return std::shared_ptr<VRXLocaleMonitor>(new VRXLocaleMonitor(std::move(agent), std::move(makeFollowUp)));
}

VRXLocaleMonitor::~VRXLocaleMonitor() {
    if (_languageNotifyToken != 0) Platform::current().notificationCenter().cancel(_languageNotifyToken);
}

void VRXLocaleMonitor::start() {
    _languageNotifyToken = Platform::current().notificationCenter().registerForNotification(
        platform::vendorIdentifier(platform::languageChangedNotification), Platform::current().queues().mainQueue(),
        [monitor = weak_from_this()] { callLater(monitor); });
}

// Keeps the process from ending before the call: nothing would tell the next process of the change.
void VRXLocaleMonitor::callLater(std::weak_ptr<VRXLocaleMonitor> monitor) {
    auto work = Platform::current().processLifecycle().beginWork();
    Platform::current().queues().mainQueue().postAfter(settlingTime,
                                                       [monitor = std::move(monitor), work = std::move(work)] {
                                                           if (auto self = monitor.lock()) self->localeDidChange();
                                                       });
}

void VRXLocaleMonitor::localeDidChange() {
    if (makeFollowUp_()->pendingFollowUpCount() == 0) return Platform::current().processLifecycle().exitCleanWhenIdle();
    log(Level::Default, "Locale changed and one or more followups are being displayed. Refresh warranty if needed.");
    auto finish = [work = Platform::current().processLifecycle().beginWork()](const DeviceInfoList&) {
        log(Level::Default, "Device infos refreshed after locale change");
        Platform::current().processLifecycle().exitCleanWhenIdle();
    };
    constexpr bool updateFollowUps = true;
    agent->getAllDeviceInfosUsingPolicy(VRXWarrantyLookupPolicyDefault, updateFollowUps, std::move(finish));
}

}  // namespace vrx
