// vrxhost activities: what the agent has scheduled, when it is due, and how the last runs ended.
#include <set>

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

Dictionary documentOf(const host::ActivityRun& run, bool canBeRunning) {
    return {{"began", run.began}, {"ended", valueOf(run.ended)}, {"outcome", outcomeOf(run, canBeRunning)}};
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
    if (const auto& run = activity.lastRun) document["lastRun"] = documentOf(*run, isAgentRunning);
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

// Adds the runs, in the order in which they began.
void addHistory(Outcome& outcome, const std::vector<host::ActivityRun>& runs, bool isAgentRunning) {
    std::set<std::string> seen;  // from the last run back
    Array documents(runs.size());
    std::vector<std::vector<std::string>> rows(runs.size() + 1);
    for (std::size_t i = runs.size(); i-- > 0;) {
        const host::ActivityRun& run = runs[i];
        const bool canBeRunning = seen.insert(run.identifier).second && isAgentRunning;
        Dictionary document = documentOf(run, canBeRunning);
        document["identifier"] = run.identifier;
        documents[i] = std::move(document);
        rows[i + 1] = {dateText(run.began), run.identifier, outcomeOf(run, canBeRunning), textOf(run.ended)};
    }
    rows[0] = {"BEGAN", "IDENTIFIER", "OUTCOME", "ENDED"};
    outcome.document["history"] = std::move(documents);
    outcome.text = runs.empty() ? "Nothing has run yet.\n" : table(rows);
}

Outcome activities(AgentView& view, bool hasHistory) {
    const Result<std::vector<AgentActivity>> list = agentActivities(view);
    if (!list) return databaseFailure(list.error(), "not-read");
    const bool isAgentRunning = host::HomeLock::isInUse(view.home());
    Array documents;
    std::vector<std::vector<std::string>> rows{{"IDENTIFIER", "DUE", "CRITERIA", "TARGET DATE", "LAST RUN"}};
    for (const AgentActivity& activity : *list) {
        documents.push_back(documentOf(activity, isAgentRunning));
        rows.push_back(rowOf(activity, isAgentRunning));
    }
    Outcome outcome{
        .document = {{"activities", documents}, {"agentRunning", isAgentRunning}},
        .text = table(rows) + (isAgentRunning ? "" : "No agent has this home: nothing runs until one is started.\n")};
    if (!hasHistory) return outcome;
    const auto all = host::listActivities(view.database());
    if (!all) return databaseFailure(all.error(), "not-read");
    addHistory(outcome, all->history, isAgentRunning);
    return outcome;
}

}  // namespace

void addActivitiesVerb(CommandLine& line, const wire::LocationOverrides& places) {
    auto profile = std::make_shared<std::optional<std::string>>();
    auto hasHistory = std::make_shared<bool>(false);
    CLI::App* verb = line.add(
        "activities", "Shows the background activities: when they are due, and their last runs",
        readOnlyVerb(places, profile, [hasHistory](AgentView& view) { return activities(view, *hasHistory); }));
    verb->add_flag("--history", *hasHistory,
                   "Shows the last " + std::to_string(host::ActivityRegistry::mostRuns) +
                       " runs of each, the latest one at the end");
}

}  // namespace vrx::apps
