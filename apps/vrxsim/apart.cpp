#include "vrxsim/apart.h"

#include <poll.h>

#include <algorithm>
#include <array>
#include <cstdio>
#include <memory>
#include <sstream>
#include <string>
#include <utility>
#include <vector>

#include "vrxsim/generator.h"
#include "vrxsim/worker.h"

namespace vrx::simulation {

namespace {

// Each as NAME MISSED NEEDLESS OLDTEXT and a blank.
std::string textOf(const DifferentSeconds& differences) {
    std::string text;
    for (const auto& [name, seconds] : differences) {
        text.append(name);
        for (const std::int64_t number : seconds) text += " " + std::to_string(number);
        text += " ";
    }
    return text;
}

DifferentSeconds differencesFrom(const std::string& text) {
    DifferentSeconds differences;
    std::istringstream words(text);
    for (std::string name; words >> name;) {
        const auto known = std::ranges::find(namedDifferences(), name, &NamedDifference::name);
        for (std::int64_t& number : differences[known->name]) words >> number;
    }
    return differences;
}

// A play as a line: trace, days, differences, restless days, and what was broken, each after a tab.
std::string lineOf(const Play& play) {
    std::array<char, 80> numbers;
    std::snprintf(numbers.data(), numbers.size(), "%016llx\t%.17g\t", static_cast<unsigned long long>(play.trace),
                  play.days);
    std::string line = numbers.data() + textOf(play.differences) + "\t";
    for (const auto& [activity, days] : play.restlessDays) line += activity + " " + std::to_string(days) + " ";
    line += "\t";
    if (play.violation)
        line += std::to_string(play.violation->day) + "\t" + play.violation->rule + "\t" + play.violation->detail;
    std::ranges::replace(line, '\n', ' ');
    return line;
}

Play playFrom(std::string line) {
    std::vector<std::string> parts;
    for (std::size_t tab; (tab = line.find('\t')) != std::string::npos; line.erase(0, tab + 1))
        parts.push_back(line.substr(0, tab));
    parts.push_back(line);
    Play play{.trace = std::stoull(parts.at(0), nullptr, 16), .days = std::stod(parts.at(1))};
    play.differences = differencesFrom(parts.at(2));
    std::istringstream restless(parts.at(3));
    for (std::string activity; restless >> activity;) restless >> play.restlessDays[activity];
    if (parts.size() == 7) play.violation = Violation{std::stod(parts[4]), parts[5], parts[6]};
    return play;
}

Play crashed(const Worker& worker) {
    return {.violation = Violation{0, crash, worker.ending()}};
}

// A worker with its share of the seeds: every so many. After a crash another one goes on behind the life that crashed.
class Share {
public:
    Share(const Exploration& exploration, std::uint64_t first) : exploration_(exploration), next_(first) { begin(); }

    int output() const { return worker_->output(); }
    bool isOver() const { return !worker_; }
    // Returns false when the taker wants no more.
    bool read(const std::function<bool(std::uint64_t, const Play&)>& take) {
        for (const std::string& line : worker_->read())
            if (!take(std::exchange(next_, next_ + step()), playFrom(line))) return false;
        if (!worker_->isOver()) return true;
        const bool hasFailed = worker_->hasFailed();
        const Play last = crashed(*worker_);
        worker_.reset();
        if (!hasFailed) return true;
        const std::uint64_t seed = std::exchange(next_, next_ + step());
        if (next_ <= exploration_.last) begin();
        return take(seed, last);
    }

private:
    std::uint64_t step() const { return static_cast<std::uint64_t>(exploration_.jobs); }
    void begin() {
        worker_.emplace([this](const Worker::Write& write) {
            for (std::uint64_t seed = next_; seed <= exploration_.last; seed += step()) {
                if (exploration_.end && std::chrono::steady_clock::now() >= *exploration_.end) break;
                Life life = lifeFromSeed(seed, exploration_.level);
                life.days = std::min(life.days, exploration_.mostDays);
                write(lineOf(play(life, {.planted = exploration_.planted})));
            }
        });
    }

    const Exploration& exploration_;
    std::uint64_t next_;
    std::optional<Worker> worker_;
};

}  // namespace

Play playApart(const Life& life, sim::Defect planted) {
    Worker worker([&](const Worker::Write& write) { write(lineOf(play(life, {.planted = planted}))); });
    std::optional<Play> result;
    while (!worker.isOver())
        for (const std::string& line : worker.read()) result = playFrom(line);
    return result.value_or(crashed(worker));
}

void explore(const Exploration& exploration, const std::function<bool(std::uint64_t seed, const Play& play)>& take) {
    std::vector<std::unique_ptr<Share>> shares;
    shares.reserve(static_cast<std::size_t>(exploration.jobs));
    for (int i = 0; i < exploration.jobs; ++i)
        shares.push_back(std::make_unique<Share>(exploration, exploration.first + static_cast<std::uint64_t>(i)));
    while (!shares.empty()) {
        std::vector<pollfd> outputs;
        outputs.reserve(shares.size());
        for (const auto& share : shares) outputs.push_back({share->output(), POLLIN, 0});
        poll(outputs.data(), outputs.size(), -1);
        for (std::size_t i = 0; i < outputs.size(); ++i)
            if (outputs[i].revents != 0 && !shares[i]->read(take)) return;
        std::erase_if(shares, [](const auto& share) { return share->isOver(); });
    }
}

}  // namespace vrx::simulation
