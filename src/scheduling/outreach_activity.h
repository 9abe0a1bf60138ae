// Decides whether, and from when on, the user is offered the plan. It downloads the record of every device, keeps those
// that ask for the offer on a carrier that allows it, and schedules the follow-up post for the earliest due date. It
// posts nothing itself. Any thread may use it.
#pragma once

#include <atomic>
#include <memory>

#include "vrx/platform/property.h"
#include "vrx/platform/timer.h"
#include "vrx/scheduling/activity_collaborators.h"
#include "vrx/scheduling/scheduler_activity_delegate.h"

namespace vrx {

class VRXOutreachActivity final : public VRXSchedulerActivityDelegate,
                                  public std::enable_shared_from_this<VRXOutreachActivity> {
public:
    explicit VRXOutreachActivity(ActivityCollaborators collaborators) : collaborators_(std::move(collaborators)) {}

    std::string identifier() const override;
    bool requiresNetwork() const override { return true; }
    // Ends as finished, whatever the downloads brought, unless the system asks for deferral.
    void performActivityForScheduler(const std::shared_ptr<VRXScheduler>& scheduler,
                                     CompletionHandler completionHandler) override;

    // Whether the record suppresses the offer for none of this device's carriers. Even for a watch's record these are
    // the carriers of this device.
    static bool currentDeviceShouldReceiveOutreachForWarranty(const VRXWarranty& warranty);

    // True from a run's start to its end.
    bool outreachInProgress() const { return outreachInProgress_; }
    void setOutreachInProgress(bool outreachInProgress) { outreachInProgress_ = outreachInProgress; }
    // The deferral watch of the run under way; null without a run. "outReach" is spelled so on purpose.
    std::shared_ptr<platform::RepeatingTimer> outReachTimer() const { return outReachTimer_.get(); }
    void setOutReachTimer(std::shared_ptr<platform::RepeatingTimer> timer) { outReachTimer_.set(std::move(timer)); }

private:
    class Run;

    static void end(Run& run, const std::weak_ptr<VRXOutreachActivity>& activity,
                    platform::BackgroundActivityResult result);

    const ActivityCollaborators collaborators_;
    std::atomic<bool> outreachInProgress_ = false;
    platform::Property<std::shared_ptr<platform::RepeatingTimer>> outReachTimer_;
};

}  // namespace vrx
