// vrxhost activities: what the agent has scheduled, when it is due, and how the last run ended.
#include "vrx/host/home/home_lock.h"
#include "vrx/platform/text.h"
#include "vrxhost/agent_activities.h"
#include "vrxhost/home.h"
#include "vrxhost/verbs.h"

namespace vrx::apps {

using platform::Array;
using platform::Date;
using platform::Dictionary;
using platform::Result;
using platform::Value;

namespace {

Value valueOf(const std::optional<Date>& date) {
    return date ? Value(*date) : Value();
}

std::string textOf(const std::optional<Date>& date) {
    return date ? dateText(*date) : "";
}

Value documentOf(const AgentActivity& activity, bool isAgentRunning) {
    Dictionary document{{"identifier", activity.identifier},
                        {"scheduled", activity.scheduled.has_value()},
                        {"due", valueOf(activity.due)},
                        {"targetDate", valueOf(activity.targetDate)}};
    if (const auto& scheduled = activity.scheduled) {
        document["delay"] = scheduled->criteria.delay;
        document["gracePeriod"] = scheduled->criteria.gracePeriod;
        document["requiresNetwork"] = scheduled->criteria.requiresNetwork;
        document["deferrals"] = scheduled->deferrals;
    }
    if (const auto& run = activity.lastRun)
        document["lastRun"] = Dictionary{
            {"began", run->began}, {"ended", valueOf(run->ended)}, {"outcome", outcomeOf(*run, isAgentRunning)}};
    return document;
}

std::string criteriaText(const host::ScheduledActivity& scheduled) {
    return "after " + std::to_string(scheduled.criteria.delay) + " s, within " +
           std::to_string(scheduled.criteria.gracePeriod) + " s" +
           (scheduled.criteria.requiresNetwork ? ", network" : "") +
           (scheduled.deferrals ? ", deferred " + std::to_string(scheduled.deferrals) + " times" : "");
}

std::string dueText(const AgentActivity& activity, bool isAgentRunning) {
    if (!activity.scheduled) return "not scheduled";
    const auto& run = activity.lastRun;
    const bool isRunning = isAgentRunning && run && !run->outcome && run->generation == activity.scheduled->generation;
    return isRunning ? "running" : activity.due ? dateAndTimeLeft(*activity.due) : "";
}

std::vector<std::string> rowOf(const AgentActivity& activity, bool isAgentRunning) {
    const auto& run = activity.lastRun;
    return {activity.identifier, dueText(activity, isAgentRunning),
            activity.scheduled ? criteriaText(*activity.scheduled) : "", textOf(activity.targetDate),
            run ? outcomeOf(*run, isAgentRunning) + (" " + textOf(run->ended.value_or(run->began))) : "never"};
}

Outcome activities(AgentView& view) {
    const Result<std::vector<AgentActivity>> list = agentActivities(view);
    if (!list) return databaseFailure(list.error(), "not-read");
    const bool isAgentRunning = host::HomeLock::isInUse(view.home());
    Array documents;
    std::vector<std::vector<std::string>> rows{{"IDENTIFIER", "DUE", "CRITERIA", "TARGET DATE", "LAST RUN"}};
    for (const AgentActivity& activity : *list) {
        documents.push_back(documentOf(activity, isAgentRunning));
        rows.push_back(rowOf(activity, isAgentRunning));
    }
    return {
        .document = {{"activities", documents}, {"agentRunning", isAgentRunning}},
        .text = table(rows) + (isAgentRunning ? "" : "No agent has this home: nothing runs until one is started.\n")};
}

}  // namespace

void addActivitiesVerb(CommandLine& line, const wire::LocationOverrides& places) {
    auto profile = std::make_shared<std::optional<std::string>>();
    line.add("activities", "Shows the background activities: when they are due, and their last runs",
             readOnlyVerb(places, profile, activities));
}

}  // namespace vrx::apps
