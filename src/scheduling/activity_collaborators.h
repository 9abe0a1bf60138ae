// What activities need of parts that make activities in turn. Start-up, which knows all parts, passes the factories in.
#pragma once

#include <functional>
#include <memory>

#include "vrx/protocols/agent_collaborators.h"
#include "vrx/protocols/agent_protocol.h"

namespace vrx {

struct ActivityCollaborators {
    // A new agent for the settings app. Null while the process is ending: device infos cannot be loaded then, and what
    // needs them is deferred to the next process.
    std::function<std::shared_ptr<VRXAgentProtocol>()> makeAgent;
    std::function<std::shared_ptr<VRXFollowUpManaging>()> makeFollowUp;
};

}  // namespace vrx
