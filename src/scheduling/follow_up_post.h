// Has the follow-ups posted that are due, and works out when it is to run again and, if any was due, when the shown
// ones are first to be refreshed. Any thread may use it.
#pragma once

#include <atomic>
#include <memory>
#include <optional>

#include "vrx/platform/date.h"
#include "vrx/platform/property.h"
#include "vrx/platform/timer.h"
#include "vrx/scheduling/activity_collaborators.h"
#include "vrx/scheduling/deferrable_run.h"
#include "vrx/scheduling/scheduler_activity_delegate.h"

namespace vrx {

class VRXFollowUpPost final : public VRXSchedulerActivityDelegate,
                              public std::enable_shared_from_this<VRXFollowUpPost> {
public:
    explicit VRXFollowUpPost(ActivityCollaborators collaborators) : collaborators_(std::move(collaborators)) {}

    std::string identifier() const override;
    bool requiresNetwork() const override { return true; }
    // Ends as deferred when no device infos can be loaded, else as finished.
    void performActivityForScheduler(const std::shared_ptr<VRXScheduler>& scheduler,
                                     CompletionHandler completionHandler) override;

    // The rule of post_date.h, with the present settings and time. "DevicesInfo" is spelled so on purpose.
    static std::optional<platform::Date> nextFollowUpPostDateWithDevicesInfo(const DeviceInfoList& deviceInfos);

    // True from a run's start to its end.
    bool followUpPostInProgress() const { return followUpPostInProgress_; }
    void setFollowUpPostInProgress(bool followUpPostInProgress) { followUpPostInProgress_ = followUpPostInProgress; }
    // The deferral watch of the run under way; null without a run.
    std::shared_ptr<platform::RepeatingTimer> followUpPostTimer() const { return followUpPostTimer_.get(); }
    void setFollowUpPostTimer(std::shared_ptr<platform::RepeatingTimer> timer) {
        followUpPostTimer_.set(std::move(timer));
    }

private:
    void finish(DeferrableRun& run, const std::optional<DeviceInfoList>& deviceInfos);
    void post(const DeviceInfoList& deviceInfos);
    void end(DeferrableRun& run, platform::BackgroundActivityResult result);

    const ActivityCollaborators collaborators_;
    std::atomic<bool> followUpPostInProgress_ = false;
    platform::Property<std::shared_ptr<platform::RepeatingTimer>> followUpPostTimer_;
};

}  // namespace vrx
