#include "vrxsim/generator.h"

#include <algorithm>
#include <span>

#include "vrxsim/random.h"

namespace vrx::simulation {

namespace {

constexpr std::int64_t minute = 60;
constexpr std::int64_t hour = 60 * minute;
constexpr std::int64_t day = 24 * hour;

const char* const serialNumbers[] = {"PHONE", "WATCH1", "WATCH2", "WATCH3"};
const char* const watches[] = {"WATCH1", "WATCH2", "WATCH3"};
const char* const languages[] = {"en_US", "de_DE", "fr_FR", "ar_EG", "hi_IN"};
const char* const carriers[] = {"26201", "31026"};

class Generator {
public:
    Generator(std::uint64_t seed, Trouble level) : random_(seed) {
        life_.seed = seed;
        life_.level = level;
    }

    Life make() {
        life_.days = random_.chance(30) ? random_.between(1, 10) : random_.between(10, 400);
        begin();
        for (const Kind& kind : kinds())
            if (life_.level >= kind.level) addAll(kind);
        std::ranges::stable_sort(life_.events, {}, &Event::second);
        std::erase_if(life_.events, [this](const Event& event) { return event.second >= life_.days * day; });
        return std::move(life_);
    }

private:
    // What happens how often in a hundred days, on average and only in lives that have it at all.
    struct Kind {
        Trouble level;
        std::int64_t inHundredDays;
        void (Generator::*add)();
    };
    static std::span<const Kind> kinds();

    void begin() {
        atBeginning_ = true;
        add("language", {random_.oneOf(languages)});
        addZone();
        for (const char* serialNumber : serialNumbers)
            if (random_.chance(85)) addRecord(serialNumber);
        for (const char* watch : watches)
            if (random_.chance(40)) add("pair", {watch, random_.chance(90) ? number(-400, 0) : "-"});
        if (random_.chance(10)) addOldLayout();
        if (random_.chance(10)) addCarrier();
        if (random_.chance(5)) add("versions", {"1", "2"});
        if (life_.level == Trouble::Wild && random_.chance(20)) add("kill-before-call", {number(1, 60), "0"});
        atBeginning_ = false;
    }

    void addAll(const Kind& kind) {
        const bool happensAtAll = random_.chance(60);
        const std::int64_t most = 2 * kind.inHundredDays * life_.days / 100 + 1;
        const std::int64_t count = random_.between(0, most);
        for (std::int64_t i = 0; happensAtAll && i < count; ++i) {
            second_ = random_.below(life_.days * day);
            (this->*kind.add)();
        }
    }

    void add(const char* verb, std::vector<std::string> words = {}, std::int64_t later = 0) {
        std::vector<Event>& events = atBeginning_ ? life_.beginning : life_.events;
        events.push_back({atBeginning_ ? 0 : second_ + later, verb, std::move(words)});
    }
    std::string number(std::int64_t least, std::int64_t most) { return std::to_string(random_.between(least, most)); }
    std::string someDay(std::int64_t least, std::int64_t most) {
        const std::int64_t quarters = random_.between(4 * least, 4 * most);
        return wordFor(static_cast<double>(quarters) / 4);
    }
    std::string serialNumber() { return random_.oneOf(serialNumbers); }
    std::int64_t aWhile() { return random_.chance(50) ? random_.between(1, 2 * hour) : random_.between(hour, 5 * day); }

    void addRecord(const std::string& serialNumber) {
        const std::int64_t today = second_ / day;
        const std::string shownFrom = random_.chance(60) ? someDay(today - 5, today + 60) : "-";
        const std::int64_t least = random_.chance(5) ? -10 : 1;
        const std::string until = random_.chance(90) ? someDay(today + least, today + 200) : "-";
        const std::string before = random_.chance(50) ? number(0, 90) : "-";
        const std::string offer = random_.chance(85) ? "1" : "0";
        const std::string carrier = random_.chance(20) ? random_.oneOf(carriers) : "-";
        add("record", {serialNumber, shownFrom, until, before, offer, carrier});
        if (until != "-") endOffer(serialNumber, numberFrom(until));
    }
    void addOldLayout() {
        const std::string until = number(5, 200);
        add("old-layout", {until});
        endOffer("PHONE", numberFrom(until));
    }
    // Few servers keep offering what has ended, and here none for more than four days: posts are then tried every
    // quarter of an hour, which soon shows nothing new.
    void endOffer(const std::string& serialNumber, double until) {
        const auto end = std::max(second_, static_cast<std::int64_t>(until * day));
        const bool isSoon = random_.chance(95);
        const std::int64_t later = random_.below(isSoon ? 8 * hour : 4 * day);
        life_.events.push_back({end + later, "no-record", {serialNumber}});
    }
    void addZone() { add("zone", {std::to_string(random_.between(-12, 14) * hour)}); }
    void addCarrier() { add("carrier", {random_.chance(70) ? random_.oneOf(carriers) : "none"}); }

    void record() {
        const std::string device = serialNumber();
        if (random_.chance(80))
            addRecord(device);
        else
            add("no-record", {device});
    }
    void pairOrUnpair() {
        const std::string watch = random_.oneOf(watches);
        const bool isPairing = random_.chance(60);
        if (isPairing)
            add("pair", {watch, wordFor(static_cast<double>(second_ - second_ % hour) / secondsOfDay)});
        else
            add("unpair", {watch});
        if (isPairing || random_.chance(50)) return;
        const std::int64_t later = aWhile();
        add("pair", {watch, number(-400, 0)}, later);
    }
    void language() {
        add("language", {random_.oneOf(languages)});
        if (random_.chance(30)) addZone();
    }
    void account() {
        add("account", {"out"});
        add("account", {"in"}, aWhile());
    }
    void carrier() { addCarrier(); }
    void flagOrVersions() {
        if (random_.chance(50)) {
            add("flag", {"off"});
            add("flag", {"on"}, aWhile());
        } else {
            const std::string low = number(1, 3);
            add("versions", {low, number(2, 4)});
            add("versions", {"2", "3"}, aWhile());
        }
    }
    void requests() {
        static const char* const operations[] = {"outreach", "store",  "support", "url", "device",    "paired",
                                                 "info",     "serial", "all",     "all", "all-update"};
        const std::string connection = number(0, 2);
        const std::int64_t count = random_.chance(70) ? 1 : random_.between(2, 12);
        for (std::int64_t i = 0; i < count; ++i) {
            const std::string operation = random_.oneOf(operations);
            const std::string device = random_.chance(90) ? serialNumber() : "STRANGER";
            const std::string policy = number(0, 3);
            add("ask", {connection, operation, device, policy}, random_.below(count * 20));
        }
        if (random_.chance(10)) add("disconnect", {connection}, random_.below(60));
    }
    void dismissal() {
        add("dismiss", {serialNumber()});
        if (random_.chance(90)) return;
        const std::int64_t later = aWhile();
        add("take-back", {}, later);
    }
    void testKeys() {
        add("internal", {"on"});
        switch (random_.below(6)) {
            case 0: add("number", {"PostUpgradeOutreachDelay", number(0, 400000)}, 1); break;
            case 1: add("number", {"OneDayInterval", number(600, 90000)}, 1); break;
            case 2: add("number", {"CachedWarrantyValidityDuration", number(0, 200000)}, 1); break;
            case 3: add("text", {"SerialNumber", serialNumber()}, 1); break;
            case 4: add("pairs", {"PairedWatchesSerialNumbers", "WATCH1", "TEST1"}, 1); break;
            default: add("text", {"WarrantyURL", "none"}, 1); break;
        }
        const std::string key = life_.events.back().words[0];
        const std::int64_t later = aWhile();
        add("forget", {key}, later);
        add("internal", {"off"}, later);
    }
    void reboot() { add("reboot", {number(20, 2 * day)}); }
    void upgrade() { add("upgrade"); }

    void machine() {
        static const char* const switches[] = {"network", "network", "metered", "deferral"};
        const std::string name = random_.oneOf(switches);
        const bool isNetwork = name == "network";
        add(name.c_str(), {isNetwork ? "off" : "on"});
        add(name.c_str(), {isNetwork ? "on" : "off"}, aWhile());
    }
    void kill() {
        const std::string down = random_.chance(70) ? number(0, 10) : number(0, 6 * hour);
        switch (random_.below(3)) {
            case 0: add("kill", {down}); break;
            case 1: add("kill-after-work", {number(1, 60), down}); break;
            default: add("kill-before-call", {number(1, 80), down}); break;
        }
    }
    // While something is under way.
    void killInWork() {
        requests();
        const std::string down = number(0, 10);
        add("kill-before-call", {number(1, 60), down});
    }
    void server() {
        static const char* const answers[] = {"401",       "500",  "cut",  "late",   "never",
                                              "malformed", "list", "null", "portal", "huge"};
        const char* const verb = random_.chance(70) ? "server" : "versions-server";
        const std::string answer = random_.oneOf(answers);
        add(verb, {answer, random_.chance(70) ? number(1, 5) : number(5, 100)});
    }
    void renewal() {
        const std::string delay = number(0, 90);
        add("renewal", {random_.chance(50) ? "fails" : "works", delay});
        add("renewal", {"works", "1"}, aWhile());
    }
    void failure() {
        static const char* const operations[] = {"settings", "post",    "clear",  "list",
                                                 "read",     "replace", "folder", "remove"};
        const std::string operation = random_.oneOf(operations);
        add("fail", {operation, number(1, 4)});
        if (random_.chance(30)) add("power-cut-in-write");
    }
    void clock() {
        const std::int64_t seconds =
            random_.chance(50) ? random_.between(-3 * hour, 3 * hour) : random_.between(-400, 400) * day;
        add("clock", {std::to_string(seconds)});
        if (random_.chance(60)) add("clock", {std::to_string(-seconds)}, aWhile());
        if (random_.chance(30)) add("reboot", {"30"}, minute);
    }

    Random random_;
    Life life_;
    std::int64_t second_ = 0;
    bool atBeginning_ = false;
};

std::span<const Generator::Kind> Generator::kinds() {
    static constexpr Kind all[] = {
        {Trouble::Calm, 6, &Generator::record},    {Trouble::Calm, 6, &Generator::pairOrUnpair},
        {Trouble::Calm, 2, &Generator::language},  {Trouble::Calm, 2, &Generator::account},
        {Trouble::Calm, 2, &Generator::carrier},   {Trouble::Calm, 1, &Generator::flagOrVersions},
        {Trouble::Calm, 20, &Generator::requests}, {Trouble::Calm, 2, &Generator::dismissal},
        {Trouble::Calm, 4, &Generator::reboot},    {Trouble::Calm, 1, &Generator::upgrade},
        {Trouble::Rough, 3, &Generator::machine},  {Trouble::Rough, 4, &Generator::kill},
        {Trouble::Rough, 4, &Generator::server},   {Trouble::Rough, 1, &Generator::renewal},
        {Trouble::Wild, 1, &Generator::testKeys},  {Trouble::Wild, 6, &Generator::killInWork},
        {Trouble::Wild, 6, &Generator::failure},   {Trouble::Wild, 2, &Generator::clock},
        {Trouble::Wild, 12, &Generator::kill},     {Trouble::Wild, 12, &Generator::server},
    };
    return all;
}

}  // namespace

Life lifeFromSeed(std::uint64_t seed, Trouble level) {
    return Generator(seed, level).make();
}

}  // namespace vrx::simulation
