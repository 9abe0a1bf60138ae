#include "vrxsim/fleet_verb.h"

#include <unistd.h>

#include <algorithm>
#include <array>
#include <chrono>
#include <cmath>
#include <cstdio>
#include <fstream>
#include <memory>

#include "vrxsim/fleet.h"
#include "vrxsim/picture.h"
#include "vrxsim/worker.h"

namespace vrx::apps {

using platform::Array;
using platform::Dictionary;
using simulation::Cause;
using simulation::Census;
using simulation::Counts;
using simulation::minutesOfDay;
using simulation::Server;
using std::chrono::steady_clock;

namespace {

constexpr std::size_t minutesOfHour = 60;

struct FleetOptions {
    simulation::Scenario scenario{};
    std::string begins = "image";
    std::uint64_t devices = 100'000;
    std::uint64_t mostLives = 20'000;
    int jobs = simulation::usualJobs();
    std::string csvFile, svgFile;

    // Each life stands for the same whole number of devices.
    std::uint64_t devicesOfLife() const { return (devices + mostLives - 1) / mostLives; }
    std::uint64_t lives() const { return (devices + devicesOfLife() - 1) / devicesOfLife(); }
};

// With commas between the thousands.
std::string grouped(std::uint64_t number) {
    std::string text = std::to_string(number);
    for (std::size_t at = text.size(); at > 3; text.insert(at, ",")) at -= 3;
    return text;
}

// Three digits that matter, or a whole number.
std::string briefly(double number) {
    if (number >= 1000) return grouped(static_cast<std::uint64_t>(std::llround(number)));
    std::array<char, 32> text;
    std::snprintf(text.data(), text.size(), "%.3g", number);
    return text.data();
}

std::string percent(std::uint64_t part, std::uint64_t whole) {
    return briefly(100 * static_cast<double>(part) / static_cast<double>(std::max<std::uint64_t>(whole, 1))) + " %";
}

std::string minuteText(std::size_t minute) {
    const std::size_t inDay = minute % minutesOfDay;
    std::array<char, 48> text;
    std::snprintf(text.data(), text.size(), "day %zu, %02zu:%02zu", minute / minutesOfDay, inDay / minutesOfHour,
                  inDay % minutesOfHour);
    return text.data();
}

struct Peak {
    std::size_t minute = 0;  // in which it begins
    std::uint64_t requests = 0;
};

// The span with the most requests; the first of equal ones.
Peak peakOf(const std::vector<std::uint64_t>& minutes, std::size_t span) {
    Peak peak;
    std::uint64_t sum = 0;
    for (std::size_t minute = 0; minute < minutes.size(); ++minute) {
        sum += minutes[minute];
        if (minute >= span) sum -= minutes[minute - span];
        if (sum > peak.requests) peak = {minute + 1 - std::min(span, minute + 1), sum};
    }
    return peak;
}

// What was counted at a server, of one cause or of all, for all devices.
class Curve {
public:
    Curve(const Counts& counts, std::optional<Cause> cause, const FleetOptions& options)
        : devicesOfLife_(options.devicesOfLife()), days_(options.scenario.days) {
        minutes_.resize(static_cast<std::size_t>(days_ * minutesOfDay));
        for (std::size_t minute = 0; minute < minutes_.size(); ++minute) minutes_[minute] = of(counts, cause, minute);
        for (const std::uint64_t count : minutes_) requests_ += count;
    }
    std::uint64_t requests() const { return requests_; }
    double mean() const { return static_cast<double>(requests_) / static_cast<double>(minutes_.size()); }
    double ofDeviceAndDay(const FleetOptions& options) const {
        return static_cast<double>(requests_) / static_cast<double>(options.lives() * devicesOfLife_) /
               static_cast<double>(days_);
    }
    Peak peakMinute() const { return peakOf(minutes_, 1); }
    Peak busiestHour() const { return peakOf(minutes_, minutesOfHour); }
    std::uint64_t at(std::size_t minute) const { return minutes_[minute]; }
    std::size_t size() const { return minutes_.size(); }

private:
    std::uint64_t of(const Counts& counts, std::optional<Cause> cause, std::size_t minute) const {
        if (!cause) return counts.inMinute(minute) * devicesOfLife_;
        const std::vector<std::uint32_t>& own = counts.minutes[static_cast<std::size_t>(*cause)];
        return minute < own.size() ? own[minute] * devicesOfLife_ : 0;
    }

    const std::uint64_t devicesOfLife_;
    const std::int64_t days_;
    std::vector<std::uint64_t> minutes_;
    std::uint64_t requests_ = 0;
};

std::vector<Cause> causesIn(const Counts& counts) {
    std::vector<Cause> causes;
    for (std::size_t i = 0; i < simulation::causeCount; ++i)
        if (const auto cause = static_cast<Cause>(i); counts.total(cause) > 0) causes.push_back(cause);
    return causes;
}

// The standard error of the number of requests, as a share of it, for what is left to chance in the lives.
double samplingError(const Census& census, const Counts& counts) {
    const auto lives = static_cast<double>(census.lives), requests = static_cast<double>(counts.requests);
    const double variance = static_cast<double>(counts.squares) / lives - requests / lives * (requests / lives);
    return requests > 0 ? std::sqrt(std::max(0.0, variance) * lives) / requests : 0;
}

Dictionary documentOf(const Curve& curve, const FleetOptions& options) {
    const Peak minute = curve.peakMinute(), hour = curve.busiestHour();
    return {
        {"requests", curve.requests()},
        {"perDeviceAndDay", curve.ofDeviceAndDay(options)},
        {"perMinute", curve.mean()},
        {"peakMinute", Dictionary{{"minute", static_cast<std::int64_t>(minute.minute)}, {"requests", minute.requests}}},
        {"busiestHour", Dictionary{{"minute", static_cast<std::int64_t>(hour.minute)}, {"requests", hour.requests}}}};
}

Dictionary documentOf(Server server, const Census& census, const FleetOptions& options) {
    const Counts& counts = census.servers[static_cast<std::size_t>(server)];
    const std::uint64_t devices = options.devicesOfLife();
    Dictionary document = documentOf(Curve(counts, {}, options), options);
    document["server"] = std::string(describe(server));
    document["samplingError"] = samplingError(census, counts);
    document["unchanged"] = counts.unchanged * devices;
    document["doubled"] = counts.doubled * devices;
    document["connections"] = counts.connections * devices;
    document["connectionsKeptLong"] = counts.connectionsKeptLong * devices;
    Array causes;
    for (const Cause cause : causesIn(counts)) {
        Dictionary entry = documentOf(Curve(counts, cause, options), options);
        entry["cause"] = std::string(describe(cause));
        causes.push_back(std::move(entry));
    }
    document["causes"] = std::move(causes);
    return document;
}

std::vector<std::string> rowOf(std::string_view server, std::string_view cause, const Curve& curve,
                               const FleetOptions& options) {
    const Peak hour = curve.busiestHour();
    return {std::string(server),
            std::string(cause),
            grouped(curve.requests()),
            briefly(curve.ofDeviceAndDay(options)),
            briefly(curve.mean()),
            grouped(curve.peakMinute().requests),
            briefly(static_cast<double>(hour.requests) / minutesOfHour),
            minuteText(hour.minute)};
}

// The busiest hour is that of the lives, whose requests come at random as well.
std::string textOf(Server server, const Census& census, const FleetOptions& options) {
    const Counts& counts = census.servers[static_cast<std::size_t>(server)];
    const std::uint64_t busiest = Curve(counts, {}, options).busiestHour().requests / options.devicesOfLife();
    const double error = 1 / std::sqrt(static_cast<double>(std::max<std::uint64_t>(busiest, 1)));
    std::string text = std::string(describe(server)) + ": by chance ± " + briefly(100 * samplingError(census, counts)) +
                       " % in all, ± " + briefly(100 * error) + " % in the busiest hour\n    " +
                       percent(counts.connections, counts.requests) + " open a connection, kept for 5 s; " +
                       percent(counts.connectionsKeptLong, counts.requests) + " if kept for 2 min\n";
    if (server == Server::Versions)
        text += "    " + percent(counts.unchanged, counts.requests) + " are answered by 304; " +
                percent(counts.doubled, counts.requests) + " go out with another one under way\n";
    return text;
}

std::string titleOf(const FleetOptions& options) {
    const simulation::Scenario& scenario = options.scenario;
    const std::string hours = ", over " + briefly(scenario.overHours) + " h";
    std::string title = grouped(options.lives() * options.devicesOfLife()) + " devices, " +
                        std::to_string(scenario.days) + " days" + (scenario.hasImage ? ": an image" + hours : "");
    if (scenario.upgrade) title += "; upgrade on day " + briefly(*scenario.upgrade) + hours;
    if (scenario.language)
        title +=
            "; " + briefly(scenario.languageShare) + " % change language on day " + briefly(*scenario.language) + hours;
    if (scenario.outage)
        title += "; outage on day " + briefly(*scenario.outage) + ", " + briefly(scenario.outageHours) + " h of " +
                 scenario.outageAnswer;
    return title + (scenario.isSpread ? "; firings spread" : "");
}

bool write(const std::string& file, const std::string& text) {
    std::ofstream output(file);
    output << text;
    return output.flush().good();
}

std::string csvOf(const Census& census, const FleetOptions& options) {
    std::vector<std::tuple<std::string, std::string, Curve>> curves;
    for (const Server server : {Server::Coverage, Server::Versions}) {
        const Counts& counts = census.servers[static_cast<std::size_t>(server)];
        for (const Cause cause : causesIn(counts))
            curves.emplace_back(describe(server), describe(cause), Curve(counts, cause, options));
    }
    std::string text = "minute,server,cause,requests\n";
    for (std::size_t minute = 0; !curves.empty() && minute < std::get<Curve>(curves.front()).size(); ++minute)
        for (const auto& [server, cause, curve] : curves)
            if (curve.at(minute) > 0)
                text +=
                    std::to_string(minute) + "," + server + "," + cause + "," + std::to_string(curve.at(minute)) + "\n";
    return text;
}

platform::Result<Census> counted(const FleetOptions& options) {
    const bool isShown = isatty(STDERR_FILENO) != 0;
    std::uint64_t played = 0;
    auto shown = steady_clock::now();
    auto result = simulation::census(
        {.scenario = options.scenario, .lives = options.lives(), .jobs = options.jobs}, [&](std::uint64_t lives) {
            played += lives;
            if (!isShown || steady_clock::now() - shown < std::chrono::milliseconds(500)) return;
            shown = steady_clock::now();
            std::fprintf(stderr, "\r%s of %s lives ", grouped(played).c_str(), grouped(options.lives()).c_str());
        });
    if (isShown) std::fprintf(stderr, "\r%60s\r", "");
    return result;
}

Outcome fleet(FleetOptions& options) {
    options.scenario.hasImage = options.begins == "image";
    const platform::Result<Census> result = counted(options);
    if (!result) return failed(ExitCode::NoAnswer, result.error().text, "", "not-played");
    const Census& census = *result;
    const std::string title = titleOf(options);
    std::vector<std::vector<std::string>> rows{
        {"SERVER", "CAUSE", "REQUESTS", "A DAY", "MEAN", "PEAK", "BUSY", "BUSIEST HOUR"}};
    std::string notes;
    Array servers;
    for (const Server server : {Server::Coverage, Server::Versions}) {
        const Counts& counts = census.servers[static_cast<std::size_t>(server)];
        for (const Cause cause : causesIn(counts))
            rows.push_back(rowOf(describe(server), describe(cause), Curve(counts, cause, options), options));
        rows.push_back(rowOf(describe(server), "all", Curve(counts, {}, options), options));
        notes += textOf(server, census, options);
        servers.push_back(documentOf(server, census, options));
    }
    const std::pair<std::string, std::string> files[] = {
        {options.csvFile, options.csvFile.empty() ? "" : csvOf(census, options)},
        {options.svgFile,
         options.svgFile.empty() ? "" : pictureOf(census, options.scenario.days, options.devicesOfLife(), title)}};
    for (const auto& [file, text] : files)
        if (!file.empty() && !write(file, text))
            return failed(ExitCode::NoAnswer, "cannot write " + file, "Name another file.", "not-written");
    return {.document = {{"devices", options.lives() * options.devicesOfLife()},
                         {"lives", census.lives},
                         {"days", options.scenario.days},
                         {"title", title},
                         {"servers", std::move(servers)}},
            .text = title + "\n" + grouped(census.lives) + " lives were played, each for " +
                    grouped(options.devicesOfLife()) + (options.devicesOfLife() == 1 ? " device\n\n" : " devices\n\n") +
                    table(rows) +
                    "\nA DAY is of one device, MEAN, PEAK and BUSY are a minute, BUSY in the busiest hour.\n" + notes};
}

CLI::Option* addDay(CLI::App& app, const char* name, std::optional<double>& day, const std::string& help) {
    return app.add_option(name, day, help)->type_name("DAY")->check(CLI::Range(0.0, 400.0));
}

}  // namespace

void addFleetVerb(CommandLine& line) {
    const auto options = std::make_shared<FleetOptions>();
    simulation::Scenario& scenario = options->scenario;
    CLI::App& app = *line.add("fleet", "Plays many ordinary devices, and counts the requests that the servers see",
                              [options] { return fleet(*options); });
    app.add_option("--devices", options->devices, "How many there are")
        ->type_name("N")
        ->check(CLI::Range(1, 1'000'000'000))
        ->capture_default_str();
    app.add_option("--days", scenario.days, "How long")->check(CLI::Range(1, 400))->capture_default_str();
    app.add_option("--lives", options->mostLives, "At most so many are played; each stands for as many devices")
        ->type_name("N")
        ->check(CLI::Range(1, 10'000'000))
        ->capture_default_str();
    app.add_option("--scenario", options->begins,
                   "image: all get the agent with an image at first; steady: they have had it for long")
        ->check(CLI::IsMember({"image", "steady"}))
        ->capture_default_str();
    app.add_option("--over", scenario.overHours, "Hours within which image, upgrade and language reach the devices")
        ->type_name("HOURS")
        ->check(CLI::Range(0.0, 2400.0))
        ->capture_default_str();
    addDay(app, "--upgrade", scenario.upgrade, "When a newer agent comes");
    addDay(app, "--language", scenario.language, "When a share of the users changes language");
    app.add_option("--share", scenario.languageShare, "Which share, in percent")
        ->type_name("PERCENT")
        ->check(CLI::Range(0.0, 100.0))
        ->capture_default_str();
    addDay(app, "--outage", scenario.outage, "When the coverage server fails");
    app.add_option("--hours", scenario.outageHours, "For how long")
        ->type_name("HOURS")
        ->check(CLI::Range(0.0, 2400.0))
        ->capture_default_str();
    const auto isAnswer = [](const std::string& text) {
        const bool isStatus = text.size() == 3 && text.find_first_not_of("0123456789") == text.npos && text >= "200";
        return isStatus || text == "cut" || text == "never" ? "" : "'" + text + "' is neither cut, never nor a status";
    };
    app.add_option("--answer", scenario.outageAnswer, "What it then answers: cut, never, or a status")
        ->type_name("ANSWER")
        ->check(isAnswer, "")
        ->capture_default_str();
    app.add_option("--ended", scenario.endedShare, "Which share of phones is still offered what has ended, in percent")
        ->type_name("PERCENT")
        ->check(CLI::Range(0.0, 100.0))
        ->capture_default_str();
    app.add_flag("--spread", scenario.isSpread,
                 "Activities fire at any moment of their grace period, as no agent does yet");
    app.add_option("--csv", options->csvFile, "Write the requests of each minute")->type_name("FILE");
    app.add_option("--svg", options->svgFile, "Draw them")->type_name("FILE");
    app.add_option("--jobs", options->jobs, "How many processes play")->type_name("N")->check(CLI::Range(1, 256));
}

}  // namespace vrx::apps
