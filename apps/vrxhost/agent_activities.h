// The agent's background activities as they stand in a home.
#pragma once

#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "vrx/host/activities/activity_registry.h"
#include "vrxhost/agent_view.h"

namespace vrx::apps {

struct AgentActivity {
    std::string identifier;
    std::optional<platform::Date> targetDate{};  // before which it does nothing
    std::optional<host::ScheduledActivity> scheduled{};
    std::optional<platform::Date> due{};  // on the wall clock, when it is scheduled
    std::optional<host::ActivityRun> lastRun{};

    // When it does its work next, unless it has to wait for the network.
    std::optional<platform::Date> nextRun() const { return due ? std::max(due, targetDate) : std::nullopt; }
};

// All that the agent has, in the order of their use, and then what else is scheduled.
platform::Result<std::vector<AgentActivity>> agentActivities(AgentView& view);

// The one of an identifier's last part, such as "outreach".
const AgentActivity& activityNamed(const std::vector<AgentActivity>& activities, std::string_view name);
std::string activityIdentifier(std::string_view name);

}  // namespace vrx::apps
