#include "vrxsim/population.h"

#include <algorithm>
#include <cmath>

#include "vrxsim/random.h"

namespace vrx::simulation {

namespace {

constexpr std::int64_t aMinute = 60;
constexpr std::int64_t anHour = 60 * aMinute;
constexpr std::int64_t aDay = 24 * anHour;

struct Weighted {
    std::int64_t value;
    std::int64_t weight;
};

constexpr Weighted hoursFromUtc[] = {{-8, 12}, {-6, 13}, {-5, 17}, {-3, 6}, {0, 12}, {1, 25}, {3, 4}, {8, 6}, {9, 5}};
constexpr Weighted watchCounts[] = {{0, 60}, {1, 34}, {2, 6}};
// When people have a device in hand, by the hours of their day.
constexpr Weighted hoursInHand[] = {{0, 2},  {1, 1},  {6, 2},  {7, 4},  {8, 5},  {9, 5},  {10, 5},
                                    {11, 5}, {12, 6}, {13, 5}, {14, 5}, {15, 5}, {16, 5}, {17, 6},
                                    {18, 7}, {19, 8}, {20, 8}, {21, 7}, {22, 5}, {23, 3}};

constexpr std::int64_t percentOffered = 35;           // of devices, watches included, have an offer
constexpr std::int64_t percentShownFrom = 50;         // of offers name the day from which they are shown
constexpr std::int64_t percentSignedOut = 5;          // of users have no account
constexpr std::int64_t percentOffAtNight = 15;        // of devices, from about 23:30 for seven hours
constexpr std::int64_t percentInstalledAtNight = 60;  // of images and upgrades, by themselves from 2:00 to 5:00
constexpr std::int64_t percentRefreshing = 10;  // of looks ask for a fresh record; the others take a day's old one
constexpr std::int64_t daysBetweenLooks = 5;    // at the page of the settings app, on average
constexpr std::int64_t daysBetweenBoots = 30;
constexpr std::int64_t daysBetweenGaps = 10;      // without a network, for some minutes to three hours
constexpr std::int64_t daysBetweenRefusals = 20;  // of an account's token, which is then renewed
constexpr std::int64_t daysBetweenPairings = 300;
// Before the scenario, for devices that have had the agent for long: the first outreach and what follows it are over.
constexpr std::int64_t leastDaysBefore = 4, mostDaysBefore = 10;

class ResidentMaker {
public:
    ResidentMaker(std::uint64_t number, const Scenario& scenario) : random_(number), scenario_(scenario) {}

    Resident make() {
        zone_ = oneOf(hoursFromUtc) * anHour;
        resident_.begin =
            scenario_.hasImage ? installedAfter(0) : -random_.between(leastDaysBefore * aDay, mostDaysBefore * aDay);
        end_ = scenario_.days * aDay - resident_.begin;
        resident_.life.days = std::max<std::int64_t>(1, (end_ + aDay - 1) / aDay);
        addBeginning();
        addDays();
        addScenario();
        const std::int64_t tenThousandths = random_.below(10'000);
        if (scenario_.isSpread) resident_.shareOfGrace = static_cast<double>(tenThousandths) / 10'000;
        std::vector<Event>& events = resident_.life.events;
        std::erase_if(events, [this](const Event& event) { return event.second < 0 || event.second >= end_; });
        std::ranges::stable_sort(events, {}, &Event::second);
        return std::move(resident_);
    }

private:
    template <std::size_t size>
    std::int64_t oneOf(const Weighted (&choices)[size]) {
        std::int64_t sum = 0;
        for (const Weighted& choice : choices) sum += choice.weight;
        std::int64_t left = random_.below(sum);
        const Weighted* choice = choices;
        while (left >= choice->weight) left -= (choice++)->weight;
        return choice->value;
    }
    // A moment of a day at which the device is in hand, in seconds of the user's day.
    std::int64_t inHand() {
        const std::int64_t hours = oneOf(hoursInHand);
        return hours * anHour + random_.below(anHour);
    }
    // The first moment of the scenario, at or after another, at which it is so late in the user's day.
    std::int64_t nextAt(std::int64_t after, std::int64_t timeOfDay) const {
        const std::int64_t now = ((after + zone_) % aDay + aDay) % aDay;
        return after + (timeOfDay - now + aDay) % aDay;
    }
    // When a device gets what is offered to one after another from a moment on.
    std::int64_t installedAfter(double offered) {
        const double part = static_cast<double>(random_.below(1'000'000)) / 1e6;
        const auto reached =
            static_cast<std::int64_t>(offered + part * scenario_.overHours * static_cast<double>(anHour));
        const bool isAtNight = random_.chance(percentInstalledAtNight);
        const std::int64_t atNight = random_.between(2 * anHour, 5 * anHour);
        const std::int64_t byHand = inHand();
        return nextAt(reached, isAtNight ? atNight : byHand);
    }

    void add(std::int64_t second, const char* verb, std::vector<std::string> words = {}) {
        resident_.life.events.push_back({second, verb, std::move(words)});
    }
    // The same by the moments of the scenario.
    void addAt(std::int64_t moment, const char* verb, std::vector<std::string> words = {}) {
        add(moment - resident_.begin, verb, std::move(words));
    }
    void addFirst(const char* verb, std::vector<std::string> words) {
        resident_.life.beginning.push_back({0, verb, std::move(words)});
    }
    std::string dayWord(std::int64_t least, std::int64_t most) { return std::to_string(random_.between(least, most)); }

    void addBeginning() {
        addFirst("language", {"en_US"});
        addFirst("zone", {std::to_string(zone_)});
        if (random_.chance(percentSignedOut)) addFirst("account", {"out"});
        addRecord("PHONE");
        for (std::int64_t i = oneOf(watchCounts); i > 0; --i) {
            const std::string watch = "WATCH" + std::to_string(i);
            const std::string since = dayWord(-700, -1);
            addFirst("pair", {watch, since});
            addRecord(watch);
        }
    }
    void addRecord(const std::string& serialNumber) {
        const bool isOffered = random_.chance(percentOffered);
        const bool hasShownFrom = random_.chance(percentShownFrom);
        const std::string shownFrom = dayWord(-20, 60);
        const std::string until = dayWord(60, 240);
        addFirst("record", {serialNumber, hasShownFrom ? shownFrom : "-", until, "60", isOffered ? "1" : "0", "-"});
        const bool mayBeEnded = scenario_.endedShare > 0 && serialNumber == "PHONE";
        if (mayBeEnded && random_.below(10'000) < std::llround(100 * scenario_.endedShare))
            addFirst("record", {serialNumber, "-", dayWord(-60, -20), "60", "1", "-"});
    }

    // One after another, at random distances with this average.
    template <class Add>
    void addEvery(std::int64_t days, Add add) {
        for (std::int64_t second = 0; second < end_;) {
            if (random_.below(days) == 0) add(nextAt(second + resident_.begin, inHand()));
            second += aDay;
        }
    }
    void addDays() {
        addEvery(daysBetweenLooks, [this](std::int64_t moment) {
            if (random_.chance(percentRefreshing))
                addAt(moment, "ask", {"0", "all", "PHONE", "2"});
            else
                addAt(moment, "ask", {"0", "all-update", "PHONE", "0"});
        });
        addEvery(daysBetweenBoots, [this](std::int64_t moment) { addAt(moment, "reboot", {"60"}); });
        addEvery(daysBetweenGaps, [this](std::int64_t moment) {
            addAt(moment, "network", {"off"});
            addAt(moment + random_.between(5 * aMinute, 3 * anHour), "network", {"on"});
        });
        addEvery(daysBetweenRefusals, [this](std::int64_t moment) { addAt(moment, "server", {"401", "1"}); });
        addEvery(daysBetweenPairings, [this](std::int64_t moment) { addAt(moment, "pair", {"WATCH3", "-"}); });
        if (random_.chance(percentOffAtNight)) addNights();
    }
    void addNights() {
        const std::int64_t bedTime = 23 * anHour + random_.below(anHour);
        for (std::int64_t second = 0; second < end_; second += aDay)
            addAt(nextAt(second + resident_.begin, bedTime), "reboot", {std::to_string(7 * anHour)});
    }

    static std::int64_t momentOf(double days) { return std::llround(days * secondsOfDay); }
    void addScenario() {
        if (scenario_.upgrade) addAt(installedAfter(*scenario_.upgrade * secondsOfDay), "upgrade");
        if (scenario_.language && random_.chance(std::llround(scenario_.languageShare))) {
            const auto hours = std::max<std::int64_t>(1, std::llround(scenario_.overHours));
            const std::int64_t offered = momentOf(*scenario_.language) + random_.below(hours * anHour);
            addAt(nextAt(offered, inHand()), "language", {"de_DE"});
        }
        if (!scenario_.outage) return;
        const std::int64_t begin = momentOf(*scenario_.outage);
        const std::int64_t end = begin + momentOf(scenario_.outageHours / 24);
        // The life may begin in the midst of it.
        addAt(std::clamp(resident_.begin, begin, end), "outage", {scenario_.outageAnswer});
        addAt(end, "outage", {"over"});
    }

    Random random_;
    const Scenario& scenario_;
    Resident resident_;
    std::int64_t zone_ = 0;  // seconds from UTC
    std::int64_t end_ = 0;   // of the scenario, in seconds of the life
};

}  // namespace

Resident residentFrom(std::uint64_t number, const Scenario& scenario) {
    return ResidentMaker(number, scenario).make();
}

}  // namespace vrx::simulation
