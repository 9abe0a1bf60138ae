// The agent of a home, as other processes see it. One thread.
#pragma once

#include <cstdint>
#include <optional>
#include <string>

#include "vrx/client/agent_connection.h"
#include "vrx/host/ipc/host_requests.h"
#include "vrx/platform/date.h"
#include "vrx/wire/locations.h"

namespace vrx::apps {

struct RunningAgent {
    enum class Presence : std::uint8_t { No, Yes, Unknown };  // unknown to a user who may not look into the home
    Presence presence = Presence::No;
    // What the agent at the socket says of itself, or why it does not. Neither, unless an agent runs.
    std::optional<host::AgentStatus> status = {};
    std::optional<client::Failure> failure = {};
};

// Asks only where an agent has the home, so that a service manager starts none.
RunningAgent findRunningAgent(const wire::Locations& places, platform::Duration limit);

// Who may look into the home that this user may not look into, such as "vrxagent and root"; nothing when this user may,
// or when there is no home.
std::optional<std::string> whoElseMayLook(const std::string& home);

// What only root and the agent's user can write is judged as the agent would from now on: root may look at another's.
void judgeAsAgentAt(const std::string& home);

// "maya", or "user 1000" where nobody knows a name.
std::string userName(uid_t user);

}  // namespace vrx::apps
