// The agent's background activities, as host.db has them.
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
    std::optional<platform::Date> targetDate{};  // it does nothing before
    std::optional<host::ScheduledActivity> scheduled{};
    std::optional<platform::Date> due{};  // on the wall clock, when it is scheduled
    std::optional<host::ActivityRun> lastRun{};

    // When it works next, unless it has to wait for the network.
    std::optional<platform::Date> nextRun() const { return due ? std::max(due, targetDate) : std::nullopt; }
};

// The agent's own, in the order of their use, with their target dates alone.
std::vector<AgentActivity> ownActivities();
// All activities of the agent, in the order of their use, then whatever else is scheduled.
platform::Result<std::vector<AgentActivity>> agentActivities(AgentView& view);

// The outcome of a run. The last one without an end is under way, or was when the agent ended.
const char* outcomeOf(const host::ActivityRun& run, bool canBeRunning);

// The activity with that last part of its identifier, such as "outreach".
const AgentActivity& activityNamed(const std::vector<AgentActivity>& activities, std::string_view name);
std::string activityIdentifier(std::string_view name);

}  // namespace vrx::apps
