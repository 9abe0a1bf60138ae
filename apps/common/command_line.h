// What the command-line programs have in common: the verbs with their options, the two forms of output, and the exit
// codes. With --json, standard output is one JSON document, whatever happens:
//
//     {"version": 1, "ok": true, …what the verb gives…}
//     {"version": 1, "ok": false, "error": {"kind": "not-reachable", "message": …, "advice": …}, …what is known…}
//
// Without it, standard output is text for people. In both cases, standard error says what went wrong and what to try
// next. A verb with --watch shows one outcome after another, each document on a line of its own. One thread.
#pragma once

#include <CLI/CLI.hpp>
#include <functional>
#include <string>
#include <string_view>
#include <vector>

#include "common/manual.h"
#include "common/presentation.h"
#include "vrx/platform/value.h"

namespace vrx::apps {

// The same with and without --json. Done includes "nothing to do" and an empty list.
enum class ExitCode { Done = 0, NoAnswer = 1, Usage = 2, NotReachable = 3, Refused = 4, TimedOut = 5 };

// The result of a verb.
struct Outcome {
    ExitCode code = ExitCode::Done;
    platform::Dictionary document{};      // for programs
    std::string text{};                   // for people, with a line break at its end; may be empty
    std::vector<std::string> warnings{};  // for people, on standard error
    // Why the code is not Done, and what to try next.
    std::string problem{};
    std::string advice{};
    std::string kind{};    // the error's kind, where the code's own is too general
    bool isShown = false;  // already printed by show()
};

Outcome failed(ExitCode code, std::string problem, std::string advice, std::string kind = "");

// A value as text for people. Texts come from servers and files: what could steer a terminal or break a line is
// escaped.
std::string printable(std::string_view text);
std::string printableValue(const platform::Value& value);

// A path from the command line in the host's form: absolute, without a slash at its end.
std::string absolutePath(const std::string& path);

// Adds --timeout, in seconds above 0. The help says what is waited for.
void addTimeout(CLI::App& app, double& seconds, const std::string& help);

std::string secondsText(double seconds);

class CommandLine {
public:
    using Verb = std::function<Outcome()>;

    CommandLine(const std::string& program, const std::string& purpose);

    // For options of every verb, which may stand before and after the verb.
    CLI::App& app() { return app_; }
    // For the manual page and the completions.
    ManualNotes& notes() { return notes_; }
    // Adds a verb, or one below the group. The returned app takes the options of this verb alone. A verb with verbs
    // below it runs when none of them is named.
    CLI::App* add(const std::string& name, const std::string& help, Verb verb, CLI::App* group = nullptr);
    CLI::App* addGroup(const std::string& name, const std::string& help);

    // Reads the arguments, runs the verb, prints its outcome and returns the program's exit code.
    int run(int argc, const char* const* argv);

    // The outcome of one verb without options, which is not shown: for a verb that is made of others.
    Outcome outcomeOf(const char* verb);

    // Each document stands on a line of its own from now on, as with --watch.
    void showLines() { isWatch_ = true; }
    // Prints an outcome while the verb goes on. Returns whether it could be written.
    bool show(const Outcome& outcome) const;

private:
    Outcome read(int argc, const char* const* argv);
    int report(const Outcome& outcome) const;

    CLI::App app_;
    ManualNotes notes_;
    const std::string program_;
    bool isJson_ = false;
    bool isWatch_ = false;
    Verb chosen_;
};

}  // namespace vrx::apps
