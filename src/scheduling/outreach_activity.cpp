#include "vrx/scheduling/outreach_activity.h"

#include <algorithm>
#include <mutex>
#include <optional>
#include <utility>

#include "vrx/coverage/records/warranty.h"
#include "vrx/coverage/warranty_downloader.h"
#include "vrx/devices/devices_manager.h"
#include "vrx/devices/records/device.h"
#include "vrx/followup/follow_up_rules.h"
#include "vrx/platform/completion_group.h"
#include "vrx/platform/log.h"
#include "vrx/platform/platform.h"
#include "vrx/platform/queue.h"
#include "vrx/platform/telephony_network_info.h"
#include "vrx/platform/vendor.h"
#include "vrx/scheduling/deferrable_run.h"
#include "vrx/scheduling/follow_up_post.h"
#include "vrx/scheduling/scheduler.h"

namespace vrx {

using platform::BackgroundActivityResult;
using platform::Date;
using platform::Level;
using platform::Platform;

// A run, with the earliest due date that its downloads have found. Downloads may end at the same time.
class VRXOutreachActivity::Run : public DeferrableRun {
public:
    using DeferrableRun::DeferrableRun;

    // Of equal dates, the first one stays.
    void addDueDate(Date date) {
        std::lock_guard lock(mutex_);
        if (!earliestDueDate_ || date < *earliestDueDate_) earliestDueDate_ = date;
    }
    std::optional<Date> earliestDueDate() const {
        std::lock_guard lock(mutex_);
        return earliestDueDate_;
    }

private:
    mutable std::mutex mutex_;
    std::optional<Date> earliestDueDate_;
};

namespace {

DeviceList allDevices() {
    DeviceList devices;
    for (auto& [serialNumber, device] : VRXDevicesManager::sharedManager()->allDevices()) devices.push_back(device);
    return devices;
}

// The due date of a device's follow-up, read from its downloaded record. Null when the record asks for no follow-up
// here, or tells no due date: such a record must not take the place of another device's date.
std::optional<Date> dueDateFromDownload(const std::optional<std::string>& serialNumber, bool success,
                                        const std::shared_ptr<VRXWarranty>& warranty) {
    log(Level::Default, "serialNumber: %@ success: %d", serialNumber, success);
    if (!success) {
        log(Level::Error, "Warranty failed to download");
        return std::nullopt;
    }
    log(Level::Default, "Warranty downloaded successfully");
    if (!warranty->qxOfferDisplay()) {
        log(Level::Default, "Warranty shows device is ineligible, complete activity without scheduling followup");
        return std::nullopt;
    }
    log(Level::Default, "Coverage check shows device should display QX offer, check on-device state");
    if (!VRXOutreachActivity::currentDeviceShouldReceiveOutreachForWarranty(*warranty)) {
        log(Level::Default,
            "Configuration does not support current device. Complete activity without scheduling followup");
        return std::nullopt;
    }
    return dueDateInRecord(*warranty);
}

// The workers as a queue for a group. The pointer owns nothing: the platform owns the workers.
std::shared_ptr<platform::Queue> backgroundQueue() {
    return {std::shared_ptr<void>(), &Platform::current().queues().workers(platform::Priority::Background)};
}

}  // namespace

std::string VRXOutreachActivity::identifier() const {
    return platform::vendorIdentifier(".vrxagent.outreach");
}

void VRXOutreachActivity::performActivityForScheduler(const std::shared_ptr<VRXScheduler>& scheduler,
                                                      CompletionHandler completionHandler) {
    setOutreachInProgress(true);
    auto run = std::make_shared<Run>(std::move(completionHandler));
    setOutReachTimer(makeDeferralWatch(scheduler, weak_from_this(), run, [](const auto& activity, Run& watched) {
        if (!activity->outreachInProgress()) return;
        log(Level::Default, "Warranty download activity deferred.");
        end(watched, activity, BackgroundActivityResult::Deferred);
    }));
    // All devices at once. The group's last step, when no download is left, schedules the post and ends the run.
    DeviceList devices = allDevices();
    log(Level::Default, "%s: devices: %@", "-[VRXOutreachActivity performActivityForScheduler:withCompletionHandler:]",
        devices);
    auto downloader = VRXWarrantyDownloader::initWithCallingProcessBundleID(
        platform::vendorIdentifier(platform::settingsAppRemainder));
    auto group = std::make_shared<platform::CompletionGroup>();
    for (const auto& device : devices) {
        group->enter();
        auto serialNumber = device->serialNumber();
        auto completion = [run, group, serialNumber](bool success, std::shared_ptr<VRXWarranty> warranty) {
            if (auto date = dueDateFromDownload(serialNumber, success, warranty)) run->addDueDate(*date);
            group->leave();
        };
        downloader->downloadWarrantyForSerialNumber(serialNumber, std::move(completion));
    }
    group->notify(backgroundQueue(), [activity = weak_from_this(), run, collaborators = collaborators_] {
        if (std::optional<Date> date = run->earliestDueDate()) {
            log(Level::Default, "Complete activity and schedule followUp post for: %@", *date);
            VRXScheduler::newSchedulerWithActivityDelegate(std::make_shared<VRXFollowUpPost>(collaborators))
                ->scheduleActivityForDate(date);
        } else {
            log(Level::Default, "No devices eligible for followUp posts");
        }
        end(*run, activity, BackgroundActivityResult::Finished);
    });
}

// The activity may be gone; the system waits for the result all the same.
void VRXOutreachActivity::end(Run& run, const std::weak_ptr<VRXOutreachActivity>& activity,
                              BackgroundActivityResult result) {
    CompletionHandler completionHandler = run.end();
    if (!completionHandler) return;
    if (auto self = activity.lock()) {
        self->setOutreachInProgress(false);
        if (auto timer = self->outReachTimer()) timer->invalidate();
        self->setOutReachTimer(nullptr);
    }
    completionHandler(result);
}

bool VRXOutreachActivity::currentDeviceShouldReceiveOutreachForWarranty(const VRXWarranty& warranty) {
    const platform::TelephonyNetworkInfo& networkInfo = Platform::current().telephonyNetworkInfo();
    const platform::Value toggle = warranty.qxOfferToggle();
    const platform::Array* excluded = toggle.asArray();
    // The first carrier on the record's list decides. A carrier without both codes is on no list.
    for (const auto& [service, carrier] : networkInfo.serviceSubscriberCellularProviders()) {
        if (!carrier.mobileCountryCode)
            log(Level::Error, "No mobileCountryCode for networkInfo: %@, carrier: %@", networkInfo, carrier);
        std::optional<std::string> carrierID;
        if (carrier.mobileCountryCode && carrier.mobileNetworkCode)
            carrierID = *carrier.mobileCountryCode + *carrier.mobileNetworkCode;
        log(Level::Default, "carrierID: %@", carrierID);
        if (!carrierID || !excluded || std::ranges::find(*excluded, platform::Value(*carrierID)) == excluded->end())
            continue;
        log(Level::Default, "carrier matched");
        return false;
    }
    return true;
}

}  // namespace vrx
