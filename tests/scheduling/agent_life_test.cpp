// The agent's own road from its installation on: what is shown at any time is what the records and the clock call for,
// whatever happens to the process.
#include <cmath>

#include "scheduling/agent_world.h"
#include "vrx/platform/known_settings.h"

namespace vrx {
namespace {

constexpr double minute = 1.0 / (24 * 60);

// This device's and two watches' follow-ups. One is dismissed; one watch is unpaired and comes back beside a new one;
// the language changes; a client has the outreach run again. Times are days.
class FourHundredDays : public testing::Test {
protected:
    struct Life {
        double shownFrom;  // by the record
        double until;
        std::vector<std::pair<double, double>> shown;
    };
    const std::map<std::string, Life> lives{
        {"PHONE", {40, 380, {{40, 380}}}},
        {"RUNNER", {10, 120.3, {{10, 70}, {85, 120.3}}}},  // again when the new one's turn comes
        {"DIVER", {20, 300, {{20, 50}}}},
        // Its end sets no date of its own, as it comes first in the list: it goes with this device's next refresh.
        {"NEWCOMER", {85, 200.6, {{85, 201}}}},
    };
    const std::vector<std::pair<double, std::function<void()>>> events{
        {50, [this] { dismiss("DIVER"); }},
        {60.1, [this] { world.setLanguage("de_DE"); }},
        {70, [this] { world.unpair("RUNNER"); }},
        {80, [this] { world.pair("NEWCOMER", 80), world.pair("RUNNER", 80); }},
        {150.1, [this] { world.request([](auto& agent) { agent.scheduleOutreachWithReply([](bool) {}); }); }},
    };

    void dismiss(const std::string& serialNumber) {
        world.request([=](auto& agent) { agent.dismissFollowUpForSerialNumber(serialNumber, [](bool) {}); });
    }
    void runToDay(double day) {
        for (; nextEvent < events.size() && events[nextEvent].first <= day; ++nextEvent) {
            world.runToDay(events[nextEvent].first);
            events[nextEvent].second();
        }
        world.runToDay(day);
    }
    void disturb(int step) {
        if (step % 29 == 5) world.host.process.reboot();
        if (step % 7 == 3) world.host.process.restart();
        if (step % 31 != 7) return;
        world.host.process.kill();
        world.host.runFor(Duration(3600));
        world.host.process.relaunch();
    }

    // Serial number, language and days left, as they are and as they are to be.
    using Facts = std::set<std::vector<std::string>>;
    Facts facts() {
        Facts facts;
        for (const auto& item : world.items())
            facts.insert({*item.userInfo.at("FollowupSerialNumber").asString(), item.title.value_or(""),
                          item.informativeFooterText.value_or("")});
        return facts;
    }
    Facts expectedFacts() const {
        Facts facts;
        const double today = world.today();
        for (const auto& [serialNumber, life] : lives)
            for (const auto& [from, until] : life.shown)
                if (today >= from && today < until)
                    facts.insert({serialNumber, today < 60.1 ? "en_US" : "de_DE",
                                  std::to_string(std::max(1, static_cast<int>(std::ceil(life.until - today))))});
        return facts;
    }

    AgentWorld world;
    std::size_t nextEvent = 0;
};

TEST_F(FourHundredDays, ShowWhatRecordsAndClockCallFor) {
    for (const char* watch : {"RUNNER", "DIVER"}) world.pair(watch, -500);
    for (const auto& [serialNumber, life] : lives) world.setRecord(serialNumber, {life.until, life.shownFrom});
    world.install();
    constexpr double aWhile = 0.02;  // within which what is due is done
    for (int step = 0; step < 1600; ++step) {
        runToDay(0.25 * step + aWhile);
        ASSERT_EQ(facts(), expectedFacts()) << "day " << world.today();
        disturb(step);
        world.host.log.clear();
    }
    EXPECT_EQ(world.runs("outreach"), 2);
    EXPECT_EQ(world.runs("followuppost"), 5) << "days 10, 20, 40, 85, and after the second outreach";
    EXPECT_EQ(world.host.process.cleanExits(), 1);
    std::set<std::string> afterTheEnd;
    for (const auto& firing : world.host.activities.firings())
        if (firing.date > AgentWorld::day(380.02)) afterTheEnd.insert(firing.identifier);
    EXPECT_THAT(afterTheEnd, ElementsAre(AgentWorld::activity("boot")));
}

// For every piece of work of the outreach, and then of the post, with the refresh that follows: the process ends right
// after it, and the next one goes on to the same end.
TEST(AgentLife, LosesNothingWhenItIsKilledAtAnyMoment) {
    constexpr double soon = 0.01;
    for (double start : {2.0, 3.0}) {
        bool isOver = false;
        for (int pieces = 0; !isOver; ++pieces) {
            ASSERT_LT(pieces, 1000) << "the work has no end";
            AgentWorld world;
            world.pair("WATCH", -30);
            world.setRecord("PHONE", {20.5, 3});
            world.setRecord("WATCH", {20.5, 10});
            world.install();
            world.runToDay(start);
            for (int i = 0; i < pieces && !isOver; ++i)
                isOver = !world.host.queues.runOne(AgentWorld::day(start + soon));
            pieces % 2 == 0 ? world.host.process.restart() : world.host.process.reboot();
            world.runToDay(3 + soon);
            ASSERT_THAT(world.shown(), ElementsAre("PHONE")) << start << " " << pieces;
            world.runToDay(3.5 + soon);
            ASSERT_EQ(world.items().at(0).informativeFooterText, "17") << start << " " << pieces;
            world.runToDay(10 + soon);
            ASSERT_THAT(world.shown(), ElementsAre("PHONE", "WATCH")) << start << " " << pieces;
        }
    }
}

// Through a whole last day the refresh asks to run again at once.
TEST(AgentLife, TakesTheLastDayEasy) {
    AgentWorld world;
    world.setRecord("PHONE", {20, 3});
    world.install();
    world.runToDay(19 - minute);
    const int before = world.runs("followuprefresh");
    EXPECT_EQ(before, 15) << "one a day";
    world.runToDay(20);
    EXPECT_THAT(world.shown(), ElementsAre("PHONE"));
    EXPECT_LE(world.runs("followuprefresh") - before, 100);
    world.runToDay(20 + 17 * minute);
    EXPECT_THAT(world.shown(), IsEmpty());
    const std::size_t firings = world.host.activities.firings().size();
    world.runToDay(50);
    EXPECT_EQ(world.host.activities.firings().size(), firings);
    for (const auto& [key, value] : world.host.defaults.dictionaryRepresentation()) {
        const platform::KnownSetting* setting = platform::findSetting(key);
        ASSERT_TRUE(setting) << key;
        EXPECT_TRUE(platform::isOfType(value, setting->type)) << key;
    }
}

// An offer that ended without ever being posted has its post tried for as long as the server asks for it.
TEST(AgentLife, LooksSeldomForAnEndedOffer) {
    AgentWorld world;
    world.pair("WATCH", -30);
    world.setRecord("PHONE", {1});
    world.install();
    world.runToDay(3);
    const std::size_t before = world.downloads();
    world.runToDay(4);
    EXPECT_LE(world.downloads() - before, 2u * 4 * 24);
    EXPECT_GE(world.downloads() - before, 2u * 4 * 23);
    EXPECT_EQ(world.runs("followuprefresh"), 0) << "nothing was due";
    world.host.files.remove("/data/W.PHONE.plist");
    world.runToDay(4.1);
    const int runs = world.runs("followuppost");
    world.runToDay(10);
    EXPECT_EQ(world.runs("followuppost"), runs);
}

// A target date is a point in time, however the clock came to it.
TEST(AgentLife, ComesRoundWhenTheClockIsSet) {
    for (double off : {-365.0, 365.0}) {
        AgentWorld world;
        world.setRecord("PHONE", {300, 5});
        world.install();
        world.runToDay(3);
        for (double days : {off, -off}) {
            EXPECT_THAT(world.shown(), IsEmpty()) << off;
            world.host.clock.set(world.host.clock.now() + AgentWorld::days(days));
            world.host.activities.wallClockWasSet();
            world.host.process.reboot();
            world.host.runFor(AgentWorld::days(1.1));
        }
        EXPECT_THAT(world.shown(), ElementsAre("PHONE")) << off;
    }
}

}  // namespace
}  // namespace vrx
