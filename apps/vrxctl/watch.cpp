#include "vrxctl/watch.h"

#include <unistd.h>

#include <csignal>

namespace vrx::apps {

using client::Change;

namespace {

Outcome outcomeOfChange(const Change& change) {
    std::string text;
    if (change.followUps) text += "follow-ups\n";
    if (change.coverage) text += "coverage\n";
    return {.document = {{"followUps", change.followUps}, {"coverage", change.coverage}}, .text = text};
}

}  // namespace

// The changes come on a thread of the library, which shows them; this one waits for the end.
Outcome showChanges(CommandLine& line, const client::ConnectionOptions& options,
                    std::function<Outcome(const Change&)> outcomeOf) {
    sigset_t ends;
    sigemptyset(&ends);
    for (const int number : {SIGINT, SIGTERM}) sigaddset(&ends, number);
    pthread_sigmask(SIG_BLOCK, &ends, nullptr);
    line.showLines();
    const client::Changes changes(
        [&](const Change& change) {
            const Outcome outcome = change.failure
                                        ? outcomeOfFailure(*change.failure, options.socketPath, options.timeLimit)
                                        : outcomeOf(change);
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

Outcome watchChanges(CommandLine& line, const client::ConnectionOptions& options) {
    return showChanges(line, options, outcomeOfChange);
}

}  // namespace vrx::apps
