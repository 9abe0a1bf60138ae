#include "vrx/scheduling/follow_up_post.h"

#include <utility>

#include "vrx/devices/records/device_info.h"
#include "vrx/platform/clock.h"
#include "vrx/platform/log.h"
#include "vrx/platform/platform.h"
#include "vrx/platform/queue.h"
#include "vrx/platform/vendor.h"
#include "vrx/scheduling/follow_up_refresh.h"
#include "vrx/scheduling/post_date.h"
#include "vrx/scheduling/scheduler.h"

namespace vrx {

using platform::BackgroundActivityResult;
using platform::Date;
using platform::Level;
using platform::Platform;

namespace {

constexpr std::string_view performName = "-[VRXFollowUpPost performActivityForScheduler:withCompletionHandler:]";

}  // namespace

std::string VRXFollowUpPost::identifier() const {
    return platform::vendorIdentifier(".vrxagent.followuppost");
}

void VRXFollowUpPost::performActivityForScheduler(const std::shared_ptr<VRXScheduler>& scheduler,
                                                  CompletionHandler completionHandler) {
    setFollowUpPostInProgress(true);
    auto run = std::make_shared<DeferrableRun>(std::move(completionHandler));
    setFollowUpPostTimer(
        makeDeferralWatch(scheduler, weak_from_this(), run, [](const auto& activity, DeferrableRun& watched) {
            if (!activity->followUpPostInProgress()) return;
            log(Level::Default, "FollowUp Post activity deferred.");
            activity->end(watched, BackgroundActivityResult::Deferred);
        }));
    auto agent = collaborators_.makeAgent();
    if (!agent) return finish(*run, std::nullopt);
    constexpr bool updateFollowUps = false;
    agent->getAllDeviceInfosUsingPolicy(
        VRXWarrantyLookupPolicyRefresh, updateFollowUps,
        [self = shared_from_this(), run](DeviceInfoList deviceInfos) { self->finish(*run, deviceInfos); });
}

void VRXFollowUpPost::finish(DeferrableRun& run, const std::optional<DeviceInfoList>& deviceInfos) {
    log(Level::Default, "%s -> %@", performName, deviceInfos);
    if (deviceInfos) {
        post(*deviceInfos);
        end(run, BackgroundActivityResult::Finished);
    } else {
        log(Level::Default, "Unable to load devices info, defer");
        end(run, BackgroundActivityResult::Deferred);
    }
}

void VRXFollowUpPost::post(const DeviceInfoList& deviceInfos) {
    const bool wasAnyDue = collaborators_.makeFollowUp()->postFollowUpWithDevicesInfo(deviceInfos);
    if (std::optional<Date> date = nextFollowUpPostDateWithDevicesInfo(deviceInfos)) {
        log(Level::Default, "%s: Re-schedule followUp post for: %@", performName, *date);
        VRXScheduler::newSchedulerWithActivityDelegate(shared_from_this())->scheduleActivityForDate(date);
    }
    if (!wasAnyDue) return;
    constexpr bool isInitialCall = true;
    std::optional<Date> date = VRXFollowUpRefresh::nextFollowUpRefreshDateWithDevicesInfo(deviceInfos, isInitialCall);
    log(Level::Default, "%s: Schedule refresh for: %@", performName, date);
    VRXScheduler::newSchedulerWithActivityDelegate(std::make_shared<VRXFollowUpRefresh>(collaborators_))
        ->scheduleActivityForDate(date);
}

void VRXFollowUpPost::end(DeferrableRun& run, BackgroundActivityResult result) {
    CompletionHandler completionHandler = run.end();
    if (!completionHandler) return;
    setFollowUpPostInProgress(false);
    if (auto timer = followUpPostTimer()) timer->invalidate();
    setFollowUpPostTimer(nullptr);
    completionHandler(result);
}

std::optional<Date> VRXFollowUpPost::nextFollowUpPostDateWithDevicesInfo(const DeviceInfoList& deviceInfos) {
    return nextPostDate(deviceInfos, PostDateSettings::read(), Platform::current().clock().now());
}

}  // namespace vrx
