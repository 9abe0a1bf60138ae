#include "vrxhost/agent_activities.h"

#include <algorithm>
#include <array>
#include <memory>

#include "vrx/host/activities/machine_conditions.h"
#include "vrx/platform/vendor.h"
#include "vrx/scheduling/follow_up_post.h"
#include "vrx/scheduling/follow_up_refresh.h"
#include "vrx/scheduling/outreach_activity.h"
#include "vrx/scheduling/scheduler.h"
#include "vrx/scheduling/start_up_activities.h"

namespace vrx::apps {

namespace {

template <class Activity>
AgentActivity own() {
    const auto scheduler =
        VRXScheduler::newSchedulerWithActivityDelegate(std::make_shared<Activity>(ActivityCollaborators{}));
    return {.identifier = scheduler->identifier(), .targetDate = scheduler->scheduledActivityDate()};
}

AgentActivity& entryFor(std::vector<AgentActivity>& activities, const std::string& identifier) {
    const auto found = std::ranges::find(activities, identifier, &AgentActivity::identifier);
    return found == activities.end() ? activities.emplace_back(AgentActivity{identifier}) : *found;
}

}  // namespace

std::vector<AgentActivity> ownActivities() {
    return {own<VRXPostUpgradeActivity>(), own<VRXPostBootActivity>(), own<VRXOutreachActivity>(),
            own<VRXFollowUpPost>(), own<VRXFollowUpRefresh>()};
}

platform::Result<std::vector<AgentActivity>> agentActivities(AgentView& view) {
    const platform::Result<host::ActivityList> list = host::listActivities(view.database());
    if (!list) return list.error();
    const platform::Moment now = host::presentMoment();
    std::vector<AgentActivity> activities = ownActivities();
    for (const host::ScheduledActivity& scheduled : list->scheduled) {
        AgentActivity& activity = entryFor(activities, scheduled.identifier);
        activity.scheduled = scheduled;
        activity.due = now.wall + timeLeft(carriedOver(scheduled.due, now), now);
    }
    for (const host::ActivityRun& run : list->runs) entryFor(activities, run.identifier).lastRun = run;
    return activities;
}

const char* outcomeOf(const host::ActivityRun& run, bool canBeRunning) {
    if (!run.outcome) return canBeRunning ? "running" : "interrupted";
    switch (*run.outcome) {
        case host::RunOutcome::Finished: return "finished";
        case host::RunOutcome::Deferred: return "deferred";
        case host::RunOutcome::Interrupted: return "interrupted";
    }
    return "";
}

const AgentActivity& activityNamed(const std::vector<AgentActivity>& activities, std::string_view name) {
    return *std::ranges::find(activities, activityIdentifier(name), &AgentActivity::identifier);
}

std::string activityIdentifier(std::string_view name) {
    return platform::vendorIdentifier(platform::serviceNameRemainder).append(".").append(name);
}

}  // namespace vrx::apps
