#include "vrxctl/watch.h"

#include <unistd.h>

#include <csignal>

#include "vrx/client/changes.h"
#include "vrx/wire/locations.h"

namespace vrx::apps {

using client::Change;

namespace {

Outcome outcomeOf(const Change& change, const client::ConnectionOptions& options) {
    if (change.failure) return outcomeOfFailure(*change.failure, options.socketPath, options.timeLimit);
    std::string text;
    if (change.followUps) text += "follow-ups\n";
    if (change.coverage) text += "coverage\n";
    return {.document = {{"followUps", change.followUps}, {"coverage", change.coverage}}, .text = text};
}

}  // namespace

// The changes come on a thread of the library, which shows them; this one waits for the end.
Outcome watchChanges(CommandLine& line, const client::ConnectionOptions& options) {
    sigset_t ends;
    sigemptyset(&ends);
    for (const int number : {SIGINT, SIGTERM}) sigaddset(&ends, number);
    pthread_sigmask(SIG_BLOCK, &ends, nullptr);
    line.showLines();
    const client::Changes changes(
        [&](const Change& change) {
            const Outcome outcome = outcomeOf(change, options);
            if (!outcome.problem.empty())
                std::fprintf(stderr, "vrxctl: %s\n%s\n", printable(outcome.problem).c_str(),
                             printable(outcome.advice).c_str());
            if (!line.show(outcome)) kill(getpid(), SIGTERM);  // nobody reads any more
        },
        options);
    int number = 0;
    sigwait(&ends, &number);
    return {.isShown = true};
}

}  // namespace vrx::apps
