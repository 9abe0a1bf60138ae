// What a change of paired devices or of the language starts, on a whole agent.
#include "scheduling/agent_world.h"
#include "vrx/devices/locale_monitor.h"
#include "vrx/followup/follow_up.h"

namespace vrx {
namespace {

class MonitorsTest : public testing::Test {
protected:
    // Day 6.5: this device's follow-up is shown since day 5.
    void SetUp() override {
        world.setRecord("PHONE", {300, 5});
        world.install();
        world.runToDay(6.5);
        ASSERT_THAT(world.shown(), ElementsAre("PHONE"));
        downloads = world.downloads();
    }

    AgentWorld world;
    std::size_t downloads = 0;
};

TEST_F(MonitorsTest, APairedWatchGetsItsPostAndAnUnpairedOneLosesIt) {
    world.setRecord("WATCH", {300, 7});
    world.pair("WATCH", 6.5);
    world.host.runFor(Duration(1));
    EXPECT_EQ(world.target("followuppost"), 8.5) << "two days after it was paired";
    EXPECT_EQ(world.downloads(), downloads + 2) << "this device's record is a day old";
    world.runToDay(9);
    EXPECT_THAT(world.shown(), ElementsAre("PHONE", "WATCH"));
    world.unpair("WATCH");
    world.host.runFor(Duration(1));
    EXPECT_THAT(world.shown(), ElementsAre("PHONE"));
    EXPECT_EQ(world.target("followuppost"), std::nullopt);
}

TEST_F(MonitorsTest, AChangeOfLanguageFetchesTheTextsInIt) {
    world.setLanguage("de_DE");
    world.host.runFor(Duration(4.9));
    EXPECT_EQ(world.downloads(), downloads);
    world.host.runFor(Duration(1));
    EXPECT_EQ(world.items().at(0).title, "de_DE");
    EXPECT_EQ(world.downloads(), downloads + 1);
    EXPECT_EQ(world.host.process.cleanExits(), 1);

    // Nobody reads what isn't shown.
    world.host.followUps.pending("com.orvane.Vireo").clear();
    world.setLanguage("fr_FR");
    world.host.runFor(Duration(6));
    EXPECT_EQ(world.downloads(), downloads + 1);
    EXPECT_EQ(world.host.process.cleanExits(), 2);
}

// Each notification has its own call; the process ends when the last one's work is done, once.
TEST_F(MonitorsTest, AStormOfLanguageChangesEndsInTheLastLanguage) {
    for (int i = 0; i < 40; ++i) {
        world.setLanguage(i % 2 == 0 ? "de_DE" : "fr_FR");
        world.host.runFor(Duration(0.1));
    }
    world.host.runFor(Duration(10));
    EXPECT_EQ(world.host.log.count("Device infos refreshed after locale change"), 40);
    EXPECT_EQ(world.items().at(0).title, "fr_FR");
    EXPECT_EQ(world.host.process.cleanExits(), 1);
    world.runToDay(8.001);
    EXPECT_EQ(world.items().at(0).informativeFooterText, "292") << "the refreshes go on";
}

TEST_F(MonitorsTest, AMonitorThatIsGoneDoesNothing) {
    world.host.process.kill();
    bool isCalled = false;
    auto monitor = VRXLocaleMonitor::initWithAgent(nullptr, [&]() -> std::shared_ptr<VRXFollowUpManaging> {
        isCalled = true;
        return std::make_shared<VRXFollowUp>();
    });
    monitor->start();
    world.host.notifications.raise(platform::languageChangedNotification);
    world.host.runFor(Duration(1));
    monitor.reset();
    EXPECT_EQ(world.host.notifications.registrationCount(), 0u);
    world.host.runFor(Duration(10));
    EXPECT_FALSE(isCalled);
}

}  // namespace
}  // namespace vrx
