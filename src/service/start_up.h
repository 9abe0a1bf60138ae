// The one place that knows all parts of the agent. It makes them at the start of the process, in a fixed order, and
// keeps them until its end. It belongs to the main thread.
#pragma once

#include <array>
#include <memory>
#include <optional>

#include "vrx/platform/service_listener.h"
#include "vrx/protocols/agent_collaborators.h"
#include "vrx/scheduling/activity_collaborators.h"
#include "vrx/service/service_delegate.h"

namespace vrx {

class VRXAgent;
class VRXLocaleMonitor;
class VRXPairedDevicesMonitor;
class VRXScheduler;

class StartUp {
public:
    // Does everything up to opening the listener; the program then runs its main loop. The current platform must be
    // set.
    StartUp();
    ~StartUp();
    StartUp(const StartUp&) = delete;
    StartUp& operator=(const StartUp&) = delete;

private:
    void monitorActivities();
    void startMonitors();
    void openListener();

    // While this lives, activities get agents.
    const std::shared_ptr<void> lifetime_ = std::make_shared<int>();
    const ActivityCollaborators activityCollaborators_;
    const AgentCollaborators agentCollaborators_;
    std::array<std::shared_ptr<VRXScheduler>, 4> schedulers_;
    std::shared_ptr<VRXAgent> agent_;
    std::shared_ptr<VRXLocaleMonitor> localeMonitor_;
    std::shared_ptr<VRXPairedDevicesMonitor> pairedDevicesMonitor_;
    std::optional<ServiceDelegate> delegate_;
    std::unique_ptr<platform::ServiceListener> listener_;
};

}  // namespace vrx
