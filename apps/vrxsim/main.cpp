// vrxsim: for testers. Plays the agent's life forward under virtual time and trouble, and finds what must not happen.
#include <unistd.h>

#include <algorithm>
#include <array>
#include <charconv>
#include <chrono>
#include <cstdio>
#include <fstream>
#include <iterator>
#include <map>
#include <memory>
#include <tuple>

#include "common/command_line.h"
#include "timeline/page.h"
#include "vrxsim/apart.h"
#include "vrxsim/defects.h"
#include "vrxsim/fleet_verb.h"
#include "vrxsim/generator.h"
#include "vrxsim/shrinker.h"
#include "vrxsim/worker.h"

namespace vrx::apps {

using platform::Array;
using platform::Dictionary;
using std::chrono::steady_clock;

namespace {

constexpr std::size_t mostFindings = 10;
constexpr std::uint64_t mostSeed = UINT64_MAX / 2;
constexpr std::uint64_t mostSeedsOfDefect = 10'000;
constexpr double daysOfYear = 365.25;

struct Options {
    std::string seeds;
    double seconds = 0;
    std::int64_t mostDays = 4000;
    int jobs = simulation::usualJobs();
    std::string level = "rough";
    std::string defect;
    std::string file;
    std::string page;
    std::uint64_t seed = 1;
    bool isTraced = false;
};

simulation::Trouble levelOf(const Options& options) {
    return simulation::troubleFrom(options.level).value_or(simulation::Trouble::Rough);
}

sim::Defect defectOf(const Options& options) {
    return simulation::defectFrom(options.defect).value_or(sim::Defect::None);
}

// A seed, or the first and the last of a range. Null for anything else.
std::optional<std::pair<std::uint64_t, std::uint64_t>> seedsFrom(std::string_view text) {
    const char* const end = text.data() + text.size();
    std::uint64_t first = 0;
    const auto [rest, error] = std::from_chars(text.data(), end, first);
    std::uint64_t last = first;
    if (error != std::errc()) return std::nullopt;
    if (rest != end) {
        if (*rest != '-') return std::nullopt;
        const auto [behind, lastError] = std::from_chars(rest + 1, end, last);
        if (lastError != std::errc() || behind != end) return std::nullopt;
    }
    return first <= last && last <= mostSeed ? std::optional(std::pair(first, last)) : std::nullopt;
}

simulation::Exploration explorationOf(const Options& options) {
    simulation::Exploration exploration{
        .level = levelOf(options), .planted = defectOf(options), .jobs = options.jobs, .mostDays = options.mostDays};
    exploration.last = mostSeed;
    if (const auto seeds = seedsFrom(options.seeds)) std::tie(exploration.first, exploration.last) = *seeds;
    if (options.seconds > 0)
        exploration.end = steady_clock::now() + std::chrono::duration_cast<steady_clock::duration>(
                                                    std::chrono::duration<double>(options.seconds));
    return exploration;
}

std::string replayOf(std::uint64_t seed, const Options& options) {
    std::string command = "vrxsim shrink " + std::to_string(seed) + " --level " + options.level;
    return options.defect.empty() ? command : command + " --defect " + options.defect;
}

std::string fixed(double number, int digits) {
    std::array<char, 64> text;
    std::snprintf(text.data(), text.size(), "%.*f", digits, number);
    return text.data();
}

std::string hashText(std::uint64_t hash) {
    std::array<char, 17> text;
    std::snprintf(text.data(), text.size(), "%016llx", static_cast<unsigned long long>(hash));
    return text.data();
}

// How far an exploration is: counted, and told at a terminal.
class Progress {
public:
    void add(double days) {
        ++lives;
        years += days / daysOfYear;
        const auto now = steady_clock::now();
        if (isShown_ && now - last_ > std::chrono::milliseconds(500)) {
            last_ = now;
            std::fprintf(stderr, "\r%zu lives, %.0f years, %.0f years a minute ", lives, years, perMinute());
        }
    }
    ~Progress() {
        if (isShown_) std::fprintf(stderr, "\r%60s\r", "");
    }
    double perMinute() const {
        const std::chrono::duration<double> spent = steady_clock::now() - begun_;
        return years / std::max(spent.count(), 1e-3) * 60;
    }

    std::size_t lives = 0;
    double years = 0;

private:
    const bool isShown_ = isatty(STDERR_FILENO) != 0;
    const steady_clock::time_point begun_ = steady_clock::now();
    steady_clock::time_point last_ = begun_;
};

Outcome asBroken(Outcome outcome, const std::string& what) {
    outcome.code = ExitCode::NoAnswer;
    outcome.problem = what;
    outcome.kind = "rule-broken";
    return outcome;
}

// In how many lives each difference occurred, and for how long in all of them.
class DifferenceTable {
public:
    void add(const simulation::DifferentSeconds& differences) {
        ++lives_;
        for (const auto& [name, seconds] : differences) {
            Sum& sum = sums_[name];
            ++sum.lives;
            for (std::size_t way = 0; way < seconds.size(); ++way) sum.seconds[way] += seconds[way];
        }
    }
    std::string text() const {
        std::vector<std::vector<std::string>> rows{
            {"DIFFERENCE", "LIVES", "PERCENT", "MISSED", "NEEDLESS", "OLD TEXT"}};
        for (const simulation::NamedDifference& named : simulation::namedDifferences()) {
            const auto sum = sums_.find(named.name);
            if (sum == sums_.end()) continue;
            rows.push_back(
                {std::string(named.name), std::to_string(sum->second.lives), fixed(percent(sum->second), 1)});
            for (const std::int64_t seconds : sum->second.seconds)
                rows.back().push_back(fixed(static_cast<double>(seconds) / simulation::secondsOfDay, 1));
        }
        return rows.size() == 1 ? ""
                                : table(rows) + "Missed, needless and with an old text for so many days of all.\n\n";
    }
    Dictionary document() const {
        Dictionary document;
        for (const auto& [name, sum] : sums_)
            document[std::string(name)] = Dictionary{{"lives", sum.lives},
                                                     {"percent", percent(sum)},
                                                     {"missedSeconds", sum.seconds[0]},
                                                     {"needlessSeconds", sum.seconds[1]},
                                                     {"oldTextSeconds", sum.seconds[2]}};
        return document;
    }

private:
    struct Sum {
        std::int64_t lives = 0;
        std::array<std::int64_t, simulation::ways> seconds{};
    };
    double percent(const Sum& sum) const {
        return 100.0 * static_cast<double>(sum.lives) / static_cast<double>(lives_);
    }

    std::int64_t lives_ = 0;
    std::map<std::string_view, Sum> sums_;
};

// In how many lives an activity ran again and again, and on how many days of all.
class RestlessActivities {
public:
    void add(const std::map<std::string, std::int64_t>& days) {
        for (const auto& [activity, count] : days) {
            ++sums_[activity].lives;
            sums_[activity].days += count;
        }
    }
    std::string text() const {
        std::string text;
        for (const auto& [activity, sum] : sums_)
            text += activity.substr(activity.rfind('.') + 1) + " ran every quarter of an hour on " +
                    std::to_string(sum.days) + " days of " + std::to_string(sum.lives) + " lives.\n";
        return text.empty() ? "" : text + "\n";
    }
    Dictionary document() const {
        Dictionary document;
        for (const auto& [activity, sum] : sums_)
            document[activity] = Dictionary{{"lives", sum.lives}, {"days", sum.days}};
        return document;
    }

private:
    struct Sum {
        std::int64_t lives = 0, days = 0;
    };
    std::map<std::string, Sum> sums_;
};

Outcome explore(const Options& options) {
    if (options.seeds.empty() && options.seconds <= 0)
        return failed(ExitCode::Usage, "neither --seeds nor --for says how many", "See vrxsim explore --help.");
    Progress progress;
    DifferenceTable differences;
    RestlessActivities restless;
    std::map<std::uint64_t, simulation::Violation> broken;
    simulation::explore(explorationOf(options), [&](std::uint64_t seed, const simulation::Play& play) {
        progress.add(play.days);
        differences.add(play.differences);
        restless.add(play.restlessDays);
        if (play.violation) broken.emplace(seed, *play.violation);
        return broken.size() < mostFindings;
    });
    Array findings;
    std::string text;
    for (const auto& [seed, violation] : broken) {
        findings.push_back(Dictionary{{"seed", seed},
                                      {"day", violation.day},
                                      {"rule", violation.rule},
                                      {"detail", violation.detail},
                                      {"replay", replayOf(seed, options)}});
        text += "seed " + std::to_string(seed) + ", day " + fixed(violation.day, 2) + ", " + violation.rule + ": " +
                printable(violation.detail) + "\n    " + replayOf(seed, options) + "\n";
    }
    const bool isFine = broken.empty();
    Outcome outcome{.document = {{"lives", static_cast<std::int64_t>(progress.lives)},
                                 {"years", progress.years},
                                 {"yearsPerMinute", progress.perMinute()},
                                 {"findings", std::move(findings)},
                                 {"differences", differences.document()},
                                 {"restless", restless.document()}}};
    outcome.text = text + differences.text() + restless.text() + std::to_string(progress.lives) + " lives, " +
                   fixed(progress.years, 0) + " years, " + fixed(progress.perMinute(), 0) + " years a minute\n";
    return isFine ? outcome : asBroken(std::move(outcome), "lives broke a rule");
}

platform::Result<simulation::Life> lifeIn(const std::string& file) {
    std::ifstream stream(file);
    const std::string text{std::istreambuf_iterator<char>(stream), {}};
    if (!stream) return platform::Error{platform::error_domain::system, errno, "cannot read " + file};
    return simulation::lifeFrom(text);
}

Outcome replay(const Options& options) {
    const platform::Result<simulation::Life> life = lifeIn(options.file);
    if (!life) return failed(ExitCode::Refused, life.error().text, "docs/simulation.md shows a life.", "not-a-life");
    simulation::PlayOptions how{.planted = defectOf(options), .isRecorded = !options.page.empty()};
    if (options.isTraced)
        how.show = [](std::string_view line) { std::fprintf(stderr, "%s\n", printable(line).c_str()); };
    const simulation::Play play = simulation::play(*life, how);
    DifferenceTable differences;
    differences.add(play.differences);
    Outcome outcome{
        .document = {{"days", play.days}, {"trace", hashText(play.trace)}, {"differences", differences.document()}},
        .text = differences.text() + fixed(play.days, 2) + " days, trace " + hashText(play.trace) + "\n"};
    if (play.chronicle) {
        const std::string problem = timeline::writePage(
            options.page, *play.chronicle, "The life in " + options.file.substr(options.file.rfind('/') + 1));
        if (!problem.empty())
            return failed(ExitCode::NoAnswer, "cannot write the page to " + problem, "Name another file with --html.",
                          "not-written");
        outcome.document["page"] = options.page;
    }
    if (!play.violation) return outcome;
    const simulation::Violation& violation = *play.violation;
    outcome.document["rule"] = violation.rule;
    outcome.document["detail"] = violation.detail;
    return asBroken(std::move(outcome),
                    "day " + fixed(violation.day, 2) + ", " + violation.rule + ": " + violation.detail);
}

Outcome shrink(const Options& options) {
    simulation::Life life = simulation::lifeFromSeed(options.seed, levelOf(options));
    const simulation::Play play = simulation::playApart(life, defectOf(options));
    if (play.violation) {
        life = simulation::shrunk(std::move(life), [&](const simulation::Life& smaller) {
            const simulation::Play played = simulation::playApart(smaller, defectOf(options));
            return played.violation ? played.violation->rule : std::string();
        });
        const simulation::Play last = simulation::playApart(life, defectOf(options));
        life.notes = {last.violation->rule + ": " + last.violation->detail};
    }
    const std::string file = options.file.empty() ? "seed-" + std::to_string(options.seed) + ".life" : options.file;
    std::ofstream output(file);
    output << simulation::textOf(life);
    if (!output.flush())
        return failed(ExitCode::NoAnswer, "cannot write " + file, "Name another file with --output.", "not-written");
    if (!play.violation)
        return {.document = {{"broken", false}, {"file", file}},
                .text = "This life breaks no rule; it is in " + file + " as it was.\n"};
    const std::string text = simulation::textOf(life) + "In " + file + "; vrxsim replay " + file +
                             (options.defect.empty() ? "" : " --defect " + options.defect) + "\n";
    return {.document = {{"broken", true}, {"file", file}, {"life", simulation::textOf(life)}}, .text = text};
}

// How many seeds it takes to find each defect.
Outcome plant(const Options& options) {
    std::vector<std::vector<std::string>> rows{{"DEFECT", "SEED", "DAY", "RULE"}};
    Array found;
    bool isAllFound = true;
    for (const simulation::NamedDefect& named : simulation::namedDefects()) {
        if (options.defect != "all" && options.defect != named.name) continue;
        simulation::Exploration exploration = explorationOf(options);
        exploration.planted = named.defect;
        exploration.jobs = 1;  // so that it is the first seed of all
        exploration.last = std::min(exploration.last, mostSeedsOfDefect);
        std::optional<std::pair<std::uint64_t, simulation::Violation>> first;
        simulation::explore(exploration, [&](std::uint64_t seed, const simulation::Play& play) {
            if (play.violation) first = std::pair(seed, *play.violation);
            return !play.violation;
        });
        isAllFound = isAllFound && first;
        const std::string name(named.name);
        if (first) {
            rows.push_back({name, std::to_string(first->first), fixed(first->second.day, 1), first->second.rule});
            found.push_back(Dictionary{{"defect", name}, {"seed", first->first}, {"rule", first->second.rule}});
        } else {
            rows.push_back({name, "not found", "", ""});
        }
    }
    if (rows.size() == 1)
        return failed(ExitCode::Usage, "there is no defect " + options.defect, "See vrxsim plant --help.");
    Outcome outcome{.document = {{"found", std::move(found)}}, .text = table(rows)};
    return isAllFound ? outcome : failed(ExitCode::NoAnswer, "a defect was not found", "", "not-found");
}

Outcome trace(const Options& options) {
    std::map<std::uint64_t, simulation::Play> plays;
    simulation::explore(explorationOf(options), [&](std::uint64_t seed, const simulation::Play& play) {
        plays.emplace(seed, play);
        return true;
    });
    Outcome outcome;
    for (const auto& [seed, play] : plays) {
        outcome.text += std::to_string(seed) + " " + hashText(play.trace) + "\n";
        outcome.document[std::to_string(seed)] = hashText(play.trace);
    }
    return outcome;
}

std::string defectNames() {
    std::string names;
    for (const simulation::NamedDefect& named : simulation::namedDefects()) names.append(" ").append(named.name);
    return names;
}

void addLevel(CLI::App& app, Options& options) {
    app.add_option("--level", options.level, "How much trouble there is")
        ->check(CLI::IsMember({"calm", "rough", "wild"}))
        ->capture_default_str();
}

void addJobs(CLI::App& app, Options& options) {
    app.add_option("--jobs", options.jobs, "How many processes play")->check(CLI::Range(1, 256));
}

CLI::Option* addSeeds(CLI::App& app, Options& options) {
    const auto check = [](const std::string& text) {
        return seedsFrom(text) ? "" : "'" + text + "' is no range of seeds such as 1-1000";
    };
    return app.add_option("--seeds", options.seeds, "Which lives")->type_name("FIRST-LAST")->check(check, "");
}

void addDefect(CLI::App& app, Options& options) {
    app.add_option("--defect", options.defect, "A defect planted in the simulated host")
        ->check([](const std::string& name) { return simulation::defectFrom(name) ? "" : "no such defect"; }, "");
}

}  // namespace

void addVerbs(CommandLine& line, Options& options) {
    CLI::App* verb =
        line.add("explore", "Plays many lives, and tells which break a rule", [&] { return explore(options); });
    addSeeds(*verb, options);
    addJobs(*verb, options);
    verb->add_option("--for", options.seconds, "How long, such as 60s or 5min")
        ->type_name("TIME")
        ->transform(CLI::AsNumberWithUnit(std::map<std::string, double>{{"s", 1}, {"min", 60}},
                                          CLI::AsNumberWithUnit::UNIT_OPTIONAL));
    addLevel(*verb, options);
    addDefect(*verb, options);
    verb = line.add("replay", "Plays the life in a file", [&] { return replay(options); });
    verb->add_option("FILE", options.file, "The life")->required();
    verb->add_flag("--trace", options.isTraced, "Show all that happens on standard error");
    verb->add_option("--html", options.page, "Write what was shown when as a page for a browser")->type_name("FILE");
    addDefect(*verb, options);
    verb = line.add("shrink", "Makes a life that breaks a rule small, and writes it to a file",
                    [&] { return shrink(options); });
    verb->add_option("SEED", options.seed, "The life")->required();
    verb->add_option("--output", options.file, "The file; else seed-SEED.life");
    addLevel(*verb, options);
    addDefect(*verb, options);
    verb = line.add("plant", "Plants a defect in the simulated host, and tells how soon it is found",
                    [&] { return plant(options); });
    verb->add_option("NAME", options.defect, "all, or one of" + defectNames())->required();
    addSeeds(*verb, options);
    addLevel(*verb, options);
    verb = line.add("trace", "Prints a hash of all that happens in each life", [&] { return trace(options); });
    addSeeds(*verb, options)->required();
    verb->add_option("--days", options.mostDays, "How many days of each life")->check(CLI::Range(1, 4000));
    addJobs(*verb, options);
    addLevel(*verb, options);
    addFleetVerb(line);
}

}  // namespace vrx::apps

int main(int argc, char** argv) {
    using namespace vrx::apps;
    CommandLine line("vrxsim", "Plays the life of a coverage agent under virtual time and trouble, for testers.");
    Options options;
    addVerbs(line, options);
    return line.run(argc, argv);
}
