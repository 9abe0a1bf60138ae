#include "vrx/scheduling/follow_up_refresh.h"

#include <utility>

#include "vrx/devices/records/device_info.h"
#include "vrx/platform/clock.h"
#include "vrx/platform/log.h"
#include "vrx/platform/platform.h"
#include "vrx/platform/vendor.h"
#include "vrx/scheduling/refresh_date.h"
#include "vrx/scheduling/scheduler.h"

namespace vrx {

using platform::BackgroundActivityResult;
using platform::Date;
using platform::Level;
using platform::Platform;

std::string VRXFollowUpRefresh::identifier() const {
    return platform::vendorIdentifier(".vrxagent.followuprefresh");
}

void VRXFollowUpRefresh::performActivityForScheduler(const std::shared_ptr<VRXScheduler>& /*scheduler*/,
                                                     CompletionHandler completionHandler) {
    auto agent = collaborators_.makeAgent();
    if (!agent) {
        log(Level::Default, "Unable to load device info for followup refresh, defer");
        return completionHandler(BackgroundActivityResult::Deferred);
    }
    constexpr bool updateFollowUps = false;
    auto finish = [self = shared_from_this(),
                   completionHandler = std::move(completionHandler)](DeviceInfoList deviceInfos) mutable {
        self->refresh(deviceInfos);
        completionHandler(BackgroundActivityResult::Finished);
    };
    agent->getAllDeviceInfosUsingPolicy(VRXWarrantyLookupPolicyCachedOnly, updateFollowUps, std::move(finish));
}

void VRXFollowUpRefresh::refresh(const DeviceInfoList& deviceInfos) {
    DeviceInfoList shown = collaborators_.makeFollowUp()->refreshFollowupWithDeviceInfos(deviceInfos);
    if (shown.empty()) return log(Level::Default, "No followups present, don't schedule another refresh");
    log(Level::Default, "Followup present, schedule refresh for %@", shown);
    constexpr bool isInitialCall = true;
    std::optional<Date> date = nextFollowUpRefreshDateWithDevicesInfo(shown, isInitialCall);
    log(Level::Default, "Schedule next refresh for %@", date);
    VRXScheduler::newSchedulerWithActivityDelegate(shared_from_this())->scheduleActivityForDate(date);
}

std::optional<Date> VRXFollowUpRefresh::nextFollowUpRefreshDateWithDevicesInfo(const DeviceInfoList& deviceInfos,
                                                                               bool isInitialCall) {
    return nextRefreshDate(deviceInfos, isInitialCall, RefreshDateSettings::read(), Platform::current().clock().now());
}

}  // namespace vrx
