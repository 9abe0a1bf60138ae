// What the agent goes by, and what it has before it: see AgentConnection::surroundings().
#pragma once

#include <optional>
#include <string>
#include <vector>

#include "vrx/platform/date.h"

namespace vrx::client {

// A background activity of the agent.
struct Activity {
    std::string identifier;
    std::string state;                    // "scheduled", "running" or "ended"
    std::optional<platform::Date> due{};  // while it is scheduled

    bool operator==(const Activity&) const = default;
};

struct Surroundings {
    std::string locale;  // language and region, such as "de_DE"
    platform::Duration oneDayInterval{86400};
    std::vector<Activity> activities{};
};

}  // namespace vrx::client
