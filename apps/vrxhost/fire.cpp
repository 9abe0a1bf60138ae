// vrxhost fire: has the running agent fire an activity now, as the system does when it falls due.
#include <chrono>
#include <memory>
#include <thread>

#include "vrx/host/activities/activity_requests.h"
#include "vrx/host/home/home_lock.h"
#include "vrx/platform/text.h"
#include "vrx/scheduling/scheduler.h"
#include "vrxhost/agent_activities.h"
#include "vrxhost/home.h"
#include "vrxhost/verbs.h"

namespace vrx::apps {

using platform::Date;

namespace {

// A finished run hands its result back a second later. Only one that takes longer is reported as running.
constexpr auto handBackLimit = std::chrono::seconds(3);

platform::Result<std::optional<host::FiringAnswer>> requestFiring(Home& home, const std::string& identifier,
                                                                  platform::Duration limit) {
    const auto end = std::chrono::steady_clock::now() + handBackLimit;
    while (true) {
        auto answer = host::requestFiring(home.path(), home.database(), identifier, limit);
        if (!answer || *answer != host::FiringAnswer::AlreadyRunning || std::chrono::steady_clock::now() > end)
            return answer;
        std::this_thread::sleep_for(std::chrono::milliseconds(50));
    }
}

struct Options {
    std::string name;
    double limit = 10;
};

// The target date is read before the firing, because the run changes it.
Outcome fire(Home& home, const Options& options) {
    const std::string& name = options.name;
    const std::string identifier = name.find('.') == std::string::npos ? activityIdentifier(name) : name;
    const std::optional<Date> target = home.defaults().date(VRXScheduler::targetDateKey(identifier));
    const auto answer = requestFiring(home, identifier, platform::Duration(options.limit));
    if (!answer) return databaseFailure(answer.error(), "not-written");
    if (!*answer)
        return failed(ExitCode::TimedOut, "the agent did not answer within " + secondsText(options.limit),
                      "Try again, or give it longer with --timeout; its log says what it does.");
    switch (**answer) {
        case host::FiringAnswer::Fired: break;
        case host::FiringAnswer::AlreadyRunning:
            return failed(ExitCode::Refused, identifier + " is running", "vrxhost activities tells when it has ended.",
                          "already-running");
        case host::FiringAnswer::Unknown:
            return failed(ExitCode::Refused, "the agent has no activity " + identifier,
                          "vrxhost activities lists those it has.", "unknown-activity");
        case host::FiringAnswer::NotStored:
            return failed(ExitCode::NoAnswer, "the agent could not write its database", "The agent's log says why.",
                          "not-written");
    }
    const bool isEarly = target && *target > std::chrono::system_clock::now();
    return {.document = {{"identifier", identifier},
                         {"fired", true},
                         {"targetDate", target ? platform::Value(*target) : platform::Value()},
                         {"early", isEarly}},
            .text = "Fired " + printable(identifier) +
                    (isEarly ? ", which does nothing before " + dateAndTimeLeft(*target) : "") + ".\n"};
}

}  // namespace

void addFireVerb(CommandLine& line, const wire::LocationOverrides& places) {
    auto options = std::make_shared<Options>();
    const CommandLine::Verb verb =
        inHome(places, Access::ReadWrite, [options](Home& home) { return fire(home, *options); });
    CLI::App* app = line.add("fire", "Fires an activity now, as the system does when it falls due", [&places, verb] {
        // Without an agent the database is not even opened.
        const std::string home = absolutePath(wire::findAgent(places).home.path);
        if (host::HomeLock::isInUse(home)) return verb();
        if (std::optional<Outcome> missing = missingDatabase(home)) return *std::move(missing);
        return failed(ExitCode::NotReachable, "no agent has the home " + home,
                      "Start an agent, or name the home of the one that runs with --home.");
    });
    app->add_option("IDENTIFIER", options->name, "The activity's identifier, or its last part, such as outreach")
        ->required();
    addTimeout(*app, options->limit, "How long to wait for the agent's answer");
}

}  // namespace vrx::apps
