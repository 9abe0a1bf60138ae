// What the host answers its clients beside the agent: who runs here. Asking touches no record, follow-up or activity.
// Any thread.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "vrx/platform/value.h"
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

class HostRequests {
public:
    explicit HostRequests(AgentStatus status) : status_(std::move(status)) {}

    // The archived root of the reply to one of wire::hostOperations.
    platform::Value answer(const wire::Operation& operation) const;

private:
    const AgentStatus status_;
};

}  // namespace vrx::host
