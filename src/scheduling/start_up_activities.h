// The two activities that the system fires by itself. One starts the agent's work when the agent first runs; the other
// takes up, after each boot, what was scheduled before it. They have no state and always finish. Any thread may use
// them.
#pragma once

#include "vrx/scheduling/activity_collaborators.h"
#include "vrx/scheduling/scheduler_activity_delegate.h"

namespace vrx {

// Does its work once in the life of the settings; later firings do nothing.
class VRXPostUpgradeActivity final : public VRXSchedulerActivityDelegate {
public:
    explicit VRXPostUpgradeActivity(ActivityCollaborators collaborators) : collaborators_(std::move(collaborators)) {}

    std::string identifier() const override;
    bool requiresNetwork() const override { return false; }
    void performActivityForScheduler(const std::shared_ptr<VRXScheduler>& scheduler,
                                     CompletionHandler completionHandler) override;

private:
    void performUpgrade() const;

    const ActivityCollaborators collaborators_;
};

// Registers outreach and refresh anew when their target dates are still stored. It leaves the follow-up post alone.
class VRXPostBootActivity final : public VRXSchedulerActivityDelegate {
public:
    explicit VRXPostBootActivity(ActivityCollaborators collaborators) : collaborators_(std::move(collaborators)) {}

    std::string identifier() const override;
    bool requiresNetwork() const override { return false; }
    void performActivityForScheduler(const std::shared_ptr<VRXScheduler>& scheduler,
                                     CompletionHandler completionHandler) override;

private:
    const ActivityCollaborators collaborators_;
};

}  // namespace vrx
