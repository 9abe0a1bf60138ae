// vrxhost fire: has the running agent fire an activity now, as the system does when it falls due.
#include <chrono>
#include <memory>
#include <thread>

#include "agent_activities.h"
#include "home.h"
#include "host/activity_requests.h"
#include "host/home_lock.h"
#include "platform/text.h"
#include "scheduling/scheduler.h"
#include "verbs.h"

namespace vrx::apps {

using platform::Date;

namespace {

constexpr platform::Duration answerLimit = std::chrono::seconds(10);
// A run that has done its work hands its result back a second later; only one that takes longer is in the way.
constexpr auto handBackLimit = std::chrono::seconds(3);

std::optional<host::FiringAnswer> requestFiring(Home& home, const std::string& identifier) {
    const auto end = std::chrono::steady_clock::now() + handBackLimit;
    while (true) {
        const auto answer = host::requestFiring(home.path(), home.database(), identifier, answerLimit);
        if (answer != host::FiringAnswer::AlreadyRunning || std::chrono::steady_clock::now() > end) return answer;
        std::this_thread::sleep_for(std::chrono::milliseconds(50));
    }
}

Outcome refused(const char* kind, std::string problem, std::string advice) {
    Outcome outcome = failed(ExitCode::Refused, std::move(problem), std::move(advice));
    outcome.kind = kind;
    return outcome;
}

Outcome fire(Home& home, const std::string& name) {
    const std::string identifier = name.find('.') == std::string::npos ? activityIdentifier(name) : name;
    const std::optional<Date> target = home.defaults().date(VRXScheduler::targetDateKey(identifier));
    const auto answer = requestFiring(home, identifier);
    if (!answer)
        return failed(ExitCode::TimedOut, "the agent did not answer in time", "Try again; its log says what it does.");
    switch (*answer) {
        case host::FiringAnswer::Fired: break;
        case host::FiringAnswer::AlreadyRunning:
            return refused("already-running", identifier + " is running",
                           "vrxhost activities tells when it has ended.");
        case host::FiringAnswer::Unknown:
            return refused("unknown-activity", "the agent has no activity " + identifier,
                           "vrxhost activities lists those it has.");
        case host::FiringAnswer::NotStored: {
            Outcome outcome =
                failed(ExitCode::NoAnswer, "the database could not be written", "The line above says why.");
            outcome.kind = "not-written";
            return outcome;
        }
    }
    const bool isEarly = target && *target > std::chrono::system_clock::now();
    return {.document = {{"identifier", identifier},
                         {"fired", true},
                         {"targetDate", target ? platform::Value(*target) : platform::Value()},
                         {"early", isEarly}},
            .text = "Fired " + printable(identifier) +
                    (isEarly ? ", which does nothing before " + platform::describe(*target) : "") + ".\n"};
}

}  // namespace

void addFireVerb(CommandLine& line, const wire::LocationOverrides& places) {
    auto identifier = std::make_shared<std::string>();
    const CommandLine::Verb verb = inHome(places, [identifier](Home& home) { return fire(home, *identifier); });
    line.add("fire", "Fires an activity now, as the system does when it falls due",
             [&places, verb] {
                 // Without an agent not even the database is opened.
                 const std::string home = absolutePath(wire::findLocations(places).home.path);
                 if (host::HomeLock::isInUse(home)) return verb();
                 return failed(ExitCode::NotReachable, "no agent has the home " + home,
                               "Start an agent, or name the home of the one that runs with --home.");
             })
        ->add_option("IDENTIFIER", *identifier, "The activity's identifier, or its last part, such as outreach")
        ->required();
}

}  // namespace vrx::apps
