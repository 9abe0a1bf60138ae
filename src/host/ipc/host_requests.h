// What the host answers its clients beside the agent. Any thread may call.
#pragma once

#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "vrx/host/base/changes.h"
#include "vrx/host/ipc/reply_box.h"
#include "vrx/platform/date.h"
#include "vrx/platform/value.h"
#include "vrx/protocols/agent_protocol.h"
#include "vrx/wire/names.h"

namespace vrx::host {

// The agent's process and its places, which stay as they are while it runs.
struct AgentStatus {
    std::int64_t process = 0;
    std::int64_t user = 0;
    std::string version = {};
    std::string home = {};
    std::vector<std::string> profile = {};  // its layers, the lowest first
    std::string socket = {};
};

platform::Value valueOf(const AgentStatus& status);
// Null when the value is not one's. Keys that are not known are passed over.
std::optional<AgentStatus> agentStatus(const platform::Value& value);

struct ActivityState {
    std::string identifier;
    std::string state;                    // "scheduled", "running" or "ended"
    std::optional<platform::Date> due{};  // while it is scheduled
};

class HostRequests {
public:
    virtual ~HostRequests() = default;

    virtual platform::Value status() const = 0;

    // What the settings app shows now.
    virtual platform::Value pendingFollowUps() const = 0;
    // Takes an item away as the user wishes; false when none is pending under the identifier.
    virtual void dismissFollowUp(const std::string& identifier, VRXAgentProtocol& agent,
                                 VRXAgentProtocol::Reply<bool> reply) const = 0;

    // Null when the user has too many subscriptions.
    virtual Changes::Subscription subscribe(uid_t user, std::function<void(Changes::Kinds)> tell) = 0;
    // Calls once every change from then on is told.
    virtual void whenChangesAreTold(std::function<void()> call) = 0;

    virtual std::string localeIdentifier() const = 0;
    virtual platform::Duration oneDayInterval() const = 0;
    virtual std::vector<ActivityState> activities() const = 0;
};

}  // namespace vrx::host
