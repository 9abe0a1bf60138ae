#include "vrxsim/fleet.h"

#include <poll.h>

#include <algorithm>
#include <cmath>
#include <memory>
#include <numeric>
#include <sstream>

#include "vrx/platform/notification_center.h"
#include "vrx/platform/vendor.h"
#include "vrxsim/clients.h"
#include "vrxsim/player.h"
#include "vrxsim/worker.h"

namespace vrx::simulation {

namespace {

constexpr std::int64_t secondsOfMinute = 60;
constexpr double secondsKept = 5, secondsKeptLong = 120;  // of a connection without a request
constexpr double secondsUnderWay = 0.1;                   // the simulated servers' own delay
constexpr std::uint64_t livesOfReport = 50;
constexpr int mostAttempts = 3;  // of the agent, for a token that is refused

// What ends the names of activities and notifications, with what it means.
struct NamedCause {
    std::string_view ending;
    Cause cause;
};
constexpr NamedCause namedCauses[] = {
    {".vrxagent.outreach", Cause::Outreach},
    {".vrxagent.followuppost", Cause::Post},
    {platform::languageChangedNotification, Cause::Language},
    {platform::devicePairedNotification, Cause::Pairing},
    {platform::deviceUnpairedNotification, Cause::Pairing},
};

// The policy stands last in the cause of a client's request.
Cause causeFrom(std::string_view text) {
    if (text.starts_with(causeOfClients)) return text.ends_with('2') ? Cause::Refresh : Cause::Look;
    for (const NamedCause& named : namedCauses)
        if (text.ends_with(named.ending)) return named.cause;
    return Cause::Other;
}

// Takes the requests of one life.
class Counter {
public:
    Counter(const Resident& resident, const Scenario& scenario, Census& census)
        : begin_(resident.begin), end_(scenario.days * minutesOfDay), census_(census) {}

    void take(const sim::SentRequest& sent) {
        const Server server = sent.request.method == "GET" ? Server::Versions : Server::Coverage;
        const double second = (sent.date - sim::Clock::start).count();
        const Cause cause = causeOf(sent);
        const double minute = std::floor((second + static_cast<double>(begin_)) / secondsOfMinute);
        Last& last = last_[static_cast<std::size_t>(server)];
        const double pause = second - std::exchange(last.second, second);
        if (minute < 0 || minute >= static_cast<double>(end_)) return;
        Counts& counts = census_.servers[static_cast<std::size_t>(server)];
        std::vector<std::uint32_t>& minutes = counts.minutes[static_cast<std::size_t>(cause)];
        minutes.resize(static_cast<std::size_t>(end_));
        ++minutes[static_cast<std::size_t>(minute)];
        ++last.requests;
        counts.unchanged += sent.status == 304;
        counts.doubled += server == Server::Versions && pause < secondsUnderWay;
        counts.connections += pause > secondsKept;
        counts.connectionsKeptLong += pause > secondsKeptLong;
    }
    void finish() {
        ++census_.lives;
        for (std::size_t i = 0; i < serverCount; ++i) {
            const std::uint64_t requests = last_[i].requests;
            census_.servers[i].requests += requests;
            census_.servers[i].squares += requests * requests;
        }
    }

private:
    struct Last {
        double second = -1e9;
        std::uint64_t requests = 0;
    };

    Cause causeOf(const sim::SentRequest& sent) {
        if (sent.request.method == "GET") return causeFrom(sent.cause);
        const std::string_view body = sent.body();
        // The serial number ends the body, whose keys are sorted.
        int& refusals = refusals_[std::string(body.substr(std::min(body.find("\"serialNumber\""), body.size())))];
        const bool isRetry = refusals > 0 && refusals < mostAttempts;
        if (!isRetry) refusals = 0;
        refusals = sent.status == 401 ? refusals + 1 : 0;
        return isRetry ? Cause::Retry : causeFrom(sent.cause);
    }

    const std::int64_t begin_;
    const std::int64_t end_;  // in minutes
    Census& census_;
    std::array<Last, serverCount> last_{};
    std::map<std::string, int> refusals_;  // in a row, by what of the body names the device
};

// What was counted, as words: each server's numbers, then the minutes that are not 0.
std::string textOf(const Census& census) {
    std::ostringstream text;
    text << census.lives;
    for (const Counts& counts : census.servers) {
        text << ' ' << counts.requests << ' ' << counts.squares << ' ' << counts.unchanged << ' ' << counts.doubled
             << ' ' << counts.connections << ' ' << counts.connectionsKeptLong;
        for (const std::vector<std::uint32_t>& minutes : counts.minutes) {
            text << ' ' << minutes.size() << ' '
                 << std::ranges::count_if(minutes, [](auto count) { return count > 0; });
            for (std::size_t minute = 0; minute < minutes.size(); ++minute)
                if (minutes[minute] > 0) text << ' ' << minute << ' ' << minutes[minute];
        }
    }
    return text.str();
}

Census censusFrom(const std::string& line) {
    std::istringstream text(line);
    Census census;
    text >> census.lives;
    for (Counts& counts : census.servers) {
        text >> counts.requests >> counts.squares >> counts.unchanged >> counts.doubled >> counts.connections >>
            counts.connectionsKeptLong;
        for (std::vector<std::uint32_t>& minutes : counts.minutes) {
            std::size_t size = 0, count = 0;
            text >> size >> count;
            minutes.resize(size);
            for (std::size_t minute = 0; count > 0; --count) {
                text >> minute;
                text >> minutes.at(minute);
            }
        }
    }
    return census;
}

// Every so many of the lives. A line tells how many more are played, and the last one what was counted.
void playShare(const Fleet& fleet, std::uint64_t first, const Worker::Write& write) {
    Census census;
    const auto step = static_cast<std::uint64_t>(fleet.jobs);
    for (std::uint64_t i = first; i < fleet.lives; i += step) {
        count(residentFrom(fleet.firstNumber + i, fleet.scenario), fleet.scenario, census);
        if (census.lives % livesOfReport == 0) write("played");
    }
    write(textOf(census));
}

void addUp(Census& sum, const Census& part) {
    sum.lives += part.lives;
    for (std::size_t i = 0; i < serverCount; ++i) sum.servers[i].add(part.servers[i]);
}

}  // namespace

std::string_view describe(Server server) {
    return server == Server::Coverage ? "coverage" : "versions";
}

std::string_view describe(Cause cause) {
    constexpr std::string_view names[] = {"outreach", "post",    "language", "pairing",
                                          "look",     "refresh", "retry",    "other"};
    return names[static_cast<std::size_t>(cause)];
}

std::uint64_t Counts::total(Cause cause) const {
    const std::vector<std::uint32_t>& of = minutes[static_cast<std::size_t>(cause)];
    return std::accumulate(of.begin(), of.end(), std::uint64_t{0});
}

std::uint64_t Counts::inMinute(std::size_t minute) const {
    std::uint64_t sum = 0;
    for (const std::vector<std::uint32_t>& of : minutes)
        if (minute < of.size()) sum += of[minute];
    return sum;
}

void Counts::add(const Counts& other) {
    for (std::size_t cause = 0; cause < causeCount; ++cause) {
        const std::vector<std::uint32_t>& more = other.minutes[cause];
        minutes[cause].resize(std::max(minutes[cause].size(), more.size()));
        for (std::size_t minute = 0; minute < more.size(); ++minute) minutes[cause][minute] += more[minute];
    }
    requests += other.requests;
    squares += other.squares;
    unchanged += other.unchanged;
    doubled += other.doubled;
    connections += other.connections;
    connectionsKeptLong += other.connectionsKeptLong;
}

void count(const Resident& resident, const Scenario& scenario, Census& census) {
    Counter counter(resident, scenario, census);
    play(resident.life, {.isJudged = false,
                         .takeSent = [&counter](const sim::SentRequest& sent) { counter.take(sent); },
                         .shareOfGrace = resident.shareOfGrace});
    counter.finish();
}

platform::Result<Census> census(const Fleet& fleet, const std::function<void(std::uint64_t lives)>& progress) {
    std::vector<std::unique_ptr<Worker>> workers;
    workers.reserve(static_cast<std::size_t>(fleet.jobs));
    for (int i = 0; i < fleet.jobs; ++i)
        workers.push_back(std::make_unique<Worker>(
            [&fleet, i](const Worker::Write& write) { playShare(fleet, static_cast<std::uint64_t>(i), write); }));
    Census sum;
    while (!workers.empty()) {
        std::vector<pollfd> outputs;
        outputs.reserve(workers.size());
        for (const auto& worker : workers) outputs.push_back({worker->output(), POLLIN, 0});
        poll(outputs.data(), outputs.size(), -1);
        for (std::size_t i = 0; i < outputs.size(); ++i) {
            if (outputs[i].revents == 0) continue;
            for (const std::string& line : workers[i]->read())
                if (line != "played")
                    addUp(sum, censusFrom(line));
                else if (progress)
                    progress(livesOfReport);
            if (workers[i]->isOver() && workers[i]->hasFailed())
                return platform::Error{platform::error_domain::system, 0,
                                       "a life was not played: " + workers[i]->ending()};
        }
        std::erase_if(workers, [](const auto& worker) { return worker->isOver(); });
    }
    return sum;
}

}  // namespace vrx::simulation
