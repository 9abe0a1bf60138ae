#include "common/command_line.h"

#include <algorithm>
#include <array>
#include <cerrno>
#include <cmath>
#include <cstdio>
#include <cstring>
#include <filesystem>

#include "common/mistakes.h"
#include "vrx/codec/core/unicode.h"
#include "vrx/codec/json.h"

namespace vrx::apps {

using platform::Dictionary;
using platform::Value;

namespace {

// The document's version. Raised when programs that read it have to change.
constexpr int documentVersion = 1;

const char* kindOf(ExitCode code) {
    switch (code) {
        case ExitCode::Done: return "done";
        case ExitCode::NoAnswer: return "no-answer";
        case ExitCode::Usage: return "usage";
        case ExitCode::NotReachable: return "not-reachable";
        case ExitCode::Refused: return "refused";
        case ExitCode::TimedOut: return "timed-out";
    }
    return "";
}

// Control characters, and those that break lines or change the direction of text.
bool steersTerminal(char32_t character) {
    return character < 0x20 || (character >= 0x7f && character < 0xa0) || character == 0x061c || character == 0x200e ||
           character == 0x200f || (character >= 0x2028 && character <= 0x202e) ||
           (character >= 0x2066 && character <= 0x2069);
}

std::string escaped(const char* format, unsigned number) {
    std::array<char, 16> text;
    const int size = std::snprintf(text.data(), text.size(), format, number);
    return {text.data(), static_cast<std::size_t>(size)};
}

ManualNotes::Lines exitCodes() {
    return {{"0", "Done; also nothing to do, an empty list"},
            {"1", "No answer: no coverage record, nothing stored, a file or a database that cannot be read or written"},
            {"2", "Usage"},
            {"3", "Not reachable: no agent at the socket, no database in the home"},
            {"4", "Refused: not entitled, too much at a time, or an argument that is not admitted"},
            {"5", "Timed out, or another process holds the database"}};
}

// A verb's help lists what it takes besides: the options of every verb.
class VerbFormatter final : public CLI::Formatter {
    std::string make_subcommands(const CLI::App* app, CLI::AppFormatMode mode) const override {
        std::string text = CLI::Formatter::make_subcommands(app, mode);
        const CLI::App* program = app;
        while (program->get_parent()) program = program->get_parent();
        if (program == app || app->get_name().empty() || mode != CLI::AppFormatMode::Normal) return text;
        return make_group("Options of every verb", false, program->get_options([&](const CLI::Option* option) {
                   return !option->get_group().empty() && option->nonpositional() && option != program->get_help_ptr();
               })) +
               text;
    }
    std::string make_footer(const CLI::App* app) const override {
        if (app->get_parent()) return "";
        return "\nExit codes: 0 done, 1 no answer, 2 usage, 3 not reachable, 4 refused, 5 timed out.\n";
    }
};

bool hasFlag(int argc, const char* const* argv, const std::string& flag) {
    return std::any_of(argv + 1, argv + argc,
                       [&](std::string_view argument) { return argument == flag || argument == flag + "=true"; });
}

}  // namespace

Outcome failed(ExitCode code, std::string problem, std::string advice, std::string kind) {
    return {.code = code, .problem = std::move(problem), .advice = std::move(advice), .kind = std::move(kind)};
}

std::string printable(std::string_view text) {
    std::string result;
    while (!text.empty()) {
        const std::string_view before = text;
        const std::optional<char32_t> character = codec::takeCharacter(text);
        if (!character) {
            result += escaped("\\x%02x", static_cast<unsigned char>(text.front()));
            text.remove_prefix(1);
        } else if (steersTerminal(*character)) {
            result += escaped("\\u{%x}", *character);
        } else {
            result += before.substr(0, before.size() - text.size());
        }
    }
    return result;
}

std::string printableValue(const Value& value) {
    if (const std::string* text = value.asString()) return printable(*text);
    if (value.asDate() || value.isNull()) return printable(value.description());
    return printable(codec::printedJson(value, codec::JsonLayout::OneLine));
}

std::string absolutePath(const std::string& path) {
    std::string result = std::filesystem::absolute(path).lexically_normal();
    while (result.size() > 1 && result.ends_with('/')) result.pop_back();
    return result;
}

void addTimeout(CLI::App& app, double& seconds, const std::string& help) {
    const auto check = [](const std::string& text) {
        double number = 0;
        const bool isNumber = CLI::detail::lexical_cast(text, number);
        return isNumber && std::isfinite(number) && number > 0 ? "" : "'" + text + "' is no number of seconds above 0";
    };
    app.add_option("--timeout", seconds, help)->type_name("SECONDS")->check(check, "")->capture_default_str();
}

std::string secondsText(double seconds) {
    return Value(seconds).description() + " s";
}

CommandLine::CommandLine(const std::string& program, const std::string& purpose)
    : app_(purpose, program), program_(program) {
    app_.require_subcommand(1);
    app_.set_version_flag("--version", program + " " VRX_VERSION);
    app_.add_flag("--json", isJson_, "Print one JSON document instead of text")->disable_flag_override();
    app_.add_flag("--wide", presentation().isWide, "Shorten nothing to the terminal's width")->disable_flag_override();
    app_.add_flag("--utc", presentation().isUtc, "Show times in UTC, not in local time")->disable_flag_override();
    app_.formatter(std::make_shared<VerbFormatter>());
    notes_ = {.exitCodes = exitCodes(), .files = agentFiles(), .environment = agentEnvironment()};
    notes_.environment.emplace_back("NO_COLOR", "No colours, unless it is empty; there are none where output is piped");
    notes_.environment.emplace_back("TZ", "The time zone of what is shown, where it is not the machine's");
}

CLI::App* CommandLine::add(const std::string& name, const std::string& help, Verb verb, CLI::App* group) {
    CLI::App* app = (group ? group : &app_)->add_subcommand(name, help)->fallthrough();
    app->callback([this, app, verb = std::move(verb)] {
        if (app->get_subcommands().empty()) chosen_ = verb;
    });
    return app;
}

CLI::App* CommandLine::addGroup(const std::string& name, const std::string& help) {
    return app_.add_subcommand(name, help)->fallthrough()->require_subcommand(1);
}

int CommandLine::run(int argc, const char* const* argv) {
    addManualOption(app_, notes_);
    lookAtTerminal();
    // Read beforehand, because a mistake may end parsing before it comes to the flags.
    isJson_ = hasFlag(argc, argv, "--json");
    isWatch_ = hasFlag(argc, argv, "--watch");
    return report(read(argc, argv));
}

Outcome CommandLine::outcomeOf(const char* verb) {
    const std::array<const char*, 2> words{program_.c_str(), verb};
    return read(static_cast<int>(words.size()), words.data());
}

// Turns every way in which parsing or the verb can end into an outcome.
Outcome CommandLine::read(int argc, const char* const* argv) {
    try {
        app_.parse(argc, argv);
        return chosen_();
    } catch (const CLI::CallForHelp&) {
        return {.document = {{"help", app_.help()}}, .text = app_.help()};
    } catch (const CLI::CallForVersion& version) {
        return {.document = {{"release", VRX_VERSION}}, .text = version.what() + std::string("\n")};
    } catch (const CLI::Success&) {  // the option has printed its result
        return {.isShown = true};
    } catch (const CLI::ParseError& error) {
        Mistake mistake = explainMistake(app_, error);
        return failed(ExitCode::Usage, std::move(mistake.problem), std::move(mistake.advice));
    } catch (const std::exception& error) {
        return failed(ExitCode::NoAnswer, error.what(),
                      "Try again; what stays so is a fault of " + program_ + ", or of the machine.", "failed");
    }
}

bool CommandLine::show(const Outcome& outcome) const {
    if (isJson_) {
        Dictionary document = outcome.document;
        document["version"] = documentVersion;
        document["ok"] = outcome.code == ExitCode::Done;
        if (outcome.code != ExitCode::Done)
            document["error"] = Dictionary{{"kind", outcome.kind.empty() ? kindOf(outcome.code) : outcome.kind},
                                           {"message", outcome.problem},
                                           {"advice", outcome.advice}};
        const auto layout = isWatch_ ? codec::JsonLayout::OneLine : codec::JsonLayout::Indented;
        std::puts(codec::printedJson(document, layout).c_str());
    } else {
        std::fputs(outcome.text.c_str(), stdout);
    }
    return std::fflush(stdout) == 0 && std::ferror(stdout) == 0;
}

int CommandLine::report(const Outcome& outcome) const {
    const bool isWritten = outcome.isShown || show(outcome);
    const int error = errno;
    const int code = static_cast<int>(outcome.code);
    for (const std::string& warning : outcome.warnings)
        std::fprintf(stderr, "%s: %s\n", program_.c_str(), printable(warning).c_str());
    if (!outcome.problem.empty())
        std::fprintf(stderr, "%s: %s\n", program_.c_str(), printable(outcome.problem).c_str());
    if (!outcome.advice.empty()) std::fprintf(stderr, "%s\n", printable(outcome.advice).c_str());
    if (isWritten) return code;
    std::fprintf(stderr, "%s: standard output cannot be written: %s\n", program_.c_str(), std::strerror(error));
    return code ? code : static_cast<int>(ExitCode::NoAnswer);
}

}  // namespace vrx::apps
