#include "vrxctl/status.h"

#include <algorithm>
#include <chrono>

#include "vrx/client/follow_ups.h"
#include "vrxctl/shown.h"
#include "vrxctl/watch.h"

namespace vrx::apps {

using client::Activity;
using client::Failure;
using client::FollowUp;
using platform::Array;
using platform::Dictionary;
using platform::Value;

namespace {

// What the agent told.
struct Situation {
    Value agent;
    DeviceInfoList infos;
    std::vector<FollowUp> followUps;
    std::optional<client::Surroundings> surroundings;  // null from an agent that does not tell
};

// What a person should do something about.
std::vector<std::string> problemsOf(const Situation& situation) {
    std::vector<std::string> problems;
    if (situation.agent["account"].asBool() == false)
        problems.emplace_back("nobody is signed in: no record can be downloaded");
    if (situation.infos.empty()) problems.emplace_back("the agent knows no device");
    for (const auto& info : situation.infos)
        if (!info->warranty())
            problems.push_back("there is no coverage record of " + coverageRow(*info).front() +
                               ": vrxctl all --policy refresh downloads it");
    if (situation.surroundings && situation.surroundings->activities.empty())
        problems.emplace_back("nothing is scheduled: vrxhost doctor tells why");
    return problems;
}

// Those that are to come or under way, the next one first.
std::vector<Activity> nextOf(const Situation& situation) {
    std::vector<Activity> next;
    if (situation.surroundings) next = situation.surroundings->activities;
    std::erase_if(next, [](const Activity& activity) { return activity.state == "ended"; });
    std::ranges::stable_sort(next, {}, [](const Activity& activity) { return activity.due; });
    return next;
}

Value followUpDocument(const FollowUp& followUp) {
    return Dictionary{{"identifier", followUp.identifier},
                      {"serialNumber", valueOf(followUp.serialNumber)},
                      {"deviceName", valueOf(followUp.deviceName)},
                      {"title", valueOf(followUp.title)},
                      {"text", valueOf(followUp.text)},
                      {"badge", followUp.hasBadge},
                      {"daysLeft", valueOf(followUp.daysLeft)},
                      {"expirationDate", valueOf(followUp.expirationDate)}};
}

Value activityDocument(const Activity& activity) {
    return Dictionary{{"identifier", activity.identifier}, {"state", activity.state}, {"due", valueOf(activity.due)}};
}

Dictionary situationDocument(const Situation& situation) {
    const std::vector<std::string> problems = problemsOf(situation);
    Array devices, followUps, next;
    for (const auto& info : situation.infos) devices.emplace_back(documentOf(*info));
    for (const FollowUp& followUp : situation.followUps) followUps.push_back(followUpDocument(followUp));
    for (const Activity& activity : nextOf(situation)) next.push_back(activityDocument(activity));
    return {{"problems", Array(problems.begin(), problems.end())},
            {"agent", situation.agent},
            {"devices", devices},
            {"followUps", followUps},
            {"next", next}};
}

std::string agentText(const Value& agent) {
    const auto account = agent["account"].asBool();
    return "Agent    release " + printableValue(agent["version"]) + ", process " + printableValue(agent["process"]) +
           ", home " + printableValue(agent["home"]) + "\n" + "Account  " +
           (!account   ? "unknown"
            : *account ? "signed in"
                       : "nobody is signed in") +
           "\n";
}

std::string shownText(const std::vector<FollowUp>& followUps) {
    if (followUps.empty()) return "Nothing is shown to the user.\n";
    std::string text = coloured("Shown to the user", Colour::Bold) + "\n";
    for (const FollowUp& followUp : followUps) {
        text += "  " + printable(followUp.title.value_or(followUp.identifier));
        if (followUp.text) text += ": " + printable(*followUp.text);
        if (const auto& whose = followUp.deviceName ? followUp.deviceName : followUp.serialNumber)
            text += " (" + printable(*whose) + ")";
        text += followUp.hasBadge ? ", with a badge\n" : "\n";
    }
    return text;
}

std::string nextText(const std::vector<Activity>& next) {
    std::vector<std::vector<std::string>> rows{{"NEXT", "WHEN"}};
    for (const Activity& activity : next)
        rows.push_back({activity.identifier.substr(activity.identifier.rfind('.') + 1),
                        activity.state == "running" ? activity.state
                        : activity.due              ? dateAndTimeLeft(*activity.due)
                                                    : ""});
    return next.empty() ? "Nothing is scheduled.\n" : table(rows);
}

std::string pageText(const Situation& situation) {
    const std::vector<std::string> problems = problemsOf(situation);
    std::string text = problems.empty() ? coloured("All is well.", Colour::Green) + "\n" : "";
    for (const std::string& problem : problems)
        text += coloured("Attention: ", Colour::Yellow) + printable(problem) + ".\n";
    std::vector<std::vector<std::string>> rows{coverageHeading};
    for (const auto& info : situation.infos) rows.push_back(coverageRow(*info));
    return text + agentText(situation.agent) + "\n" + (situation.infos.empty() ? "" : table(rows) + "\n") +
           shownText(situation.followUps) + "\n" + nextText(nextOf(situation));
}

}  // namespace

// To look at one device by itself would bring its follow-up in step, so all are asked for, from the cache alone.
Outcome status(const client::ConnectionOptions& options) {
    const auto failure = [&](const Failure& why) {
        return outcomeOfFailure(why, options.socketPath, options.timeLimit);
    };
    client::AgentConnection agent(options);
    const auto told = agent.status();
    if (!told) return failure(told.failure());
    const auto surroundings = deriveAsAgent(agent);
    if (!surroundings && surroundings.failure().kind != Failure::Kind::BadReply) return failure(surroundings.failure());
    const auto infos = agent.getAllDeviceInfosUsingPolicy(VRXWarrantyLookupPolicyCachedOnly, false);
    if (!infos) return failure(infos.failure());
    const auto followUps = client::FollowUps(options).pending();
    if (!followUps) return failure(followUps.failure());
    const Situation situation{*told, inOrder(*infos), *followUps,
                              surroundings ? std::optional(*surroundings) : std::nullopt};
    return {.document = situationDocument(situation), .text = pageText(situation)};
}

Outcome watchStatus(CommandLine& line, const client::ConnectionOptions& options) {
    return showChanges(line, options, [&](const client::Change&) {
        Outcome outcome = status(options);
        const std::string head = presentation().hasColours ? "\x1b[H\x1b[2J\x1b[3J" : "== ";
        outcome.text = head + dateText(std::chrono::system_clock::now()) + "\n" + outcome.text;
        return outcome;
    });
}

}  // namespace vrx::apps
