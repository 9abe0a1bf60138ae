#include "vrxsim/shrinker.h"

#include <algorithm>
#include <cmath>

namespace vrx::simulation {

namespace {

class Shrinker {
public:
    Shrinker(Life life, const BrokenRule& brokenRule)
        : life_(std::move(life)), brokenRule_(brokenRule), rule_(brokenRule(life_)) {}

    Life run() {
        do {
            hasChanged_ = false;
            cutDays();
            takeAway(&Life::events);
            takeAway(&Life::beginning);
            simplify(life_.beginning);
            simplify(life_.events);
        } while (hasChanged_);
        return std::move(life_);
    }

private:
    bool accept(Life smaller) {
        if (smaller == life_ || brokenRule_(smaller) != rule_) return false;
        life_ = std::move(smaller);
        return hasChanged_ = true;
    }

    // Halves the days for as long as that does, and then looks for the least number.
    void cutDays() {
        for (std::int64_t step = life_.days / 2; step > 0; step /= 2)
            while (life_.days > step && acceptDays(life_.days - step)) {
            }
    }
    bool acceptDays(std::int64_t days) {
        Life shorter = life_;
        shorter.days = days;
        std::erase_if(shorter.events,
                      [&](const Event& event) { return event.second >= days * static_cast<int>(secondsOfDay); });
        return accept(std::move(shorter));
    }

    // Ever smaller pieces, down to one event.
    void takeAway(std::vector<Event> Life::*list) {
        for (std::size_t size = std::max<std::size_t>(1, (life_.*list).size() / 2); size > 0; size /= 2)
            for (std::size_t begin = 0; begin < (life_.*list).size();) {
                Life smaller = life_;
                std::vector<Event>& events = smaller.*list;
                const std::size_t end = std::min(begin + size, events.size());
                events.erase(events.begin() + static_cast<std::ptrdiff_t>(begin),
                             events.begin() + static_cast<std::ptrdiff_t>(end));
                if (!accept(std::move(smaller))) begin += size;
            }
    }

    void simplify(std::vector<Event>& events) {
        for (std::size_t i = 0; i < events.size(); ++i) {
            simplifyTime(events, i);
            for (std::size_t word = 0; word < events[i].words.size(); ++word) simplifyWord(events, i, word);
        }
    }
    // To the day, the hour or the minute, if the order stays.
    void simplifyTime(std::vector<Event>& events, std::size_t index) {
        for (const std::int64_t unit : {86400, 3600, 60})
            for (const std::int64_t second :
                 {events[index].second / unit * unit, (events[index].second / unit + 1) * unit}) {
                const bool isInOrder = (index == 0 || events[index - 1].second <= second) &&
                                       (index + 1 == events.size() || second <= events[index + 1].second);
                if (events[index].second % unit == 0 || !isInOrder) continue;
                if (acceptEvent(events, index, [&](Event& event) { event.second = second; })) return;
            }
    }
    void simplifyWord(std::vector<Event>& events, std::size_t index, std::size_t word) {
        const double number = numberFrom(events[index].words[word]);
        if (std::isnan(number)) return;
        for (const double plainer : {0.0, 1.0, 10.0, std::round(number), std::round(number / 2)}) {
            if (std::abs(plainer) >= std::abs(number)) continue;
            if (acceptEvent(events, index, [&](Event& event) { event.words[word] = wordFor(plainer); })) return;
        }
    }
    bool acceptEvent(std::vector<Event>& events, std::size_t index, const std::function<void(Event&)>& change) {
        const auto list = &events == &life_.events ? &Life::events : &Life::beginning;
        Life plainer = life_;
        change((plainer.*list)[index]);
        return accept(std::move(plainer));
    }

    Life life_;
    const BrokenRule& brokenRule_;
    const std::string rule_;
    bool hasChanged_ = false;
};

}  // namespace

Life shrunk(Life life, const BrokenRule& brokenRule) {
    return Shrinker(std::move(life), brokenRule).run();
}

}  // namespace vrx::simulation
