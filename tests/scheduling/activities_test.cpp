// The activities one by one: what a run decides, and how it ends.
#include "scheduling/agent_world.h"
#include "vrx/devices/records/device.h"
#include "vrx/followup/follow_up.h"
#include "vrx/scheduling/follow_up_post.h"
#include "vrx/scheduling/follow_up_refresh.h"
#include "vrx/scheduling/outreach_activity.h"
#include "vrx/scheduling/scheduler.h"
#include "vrx/scheduling/start_up_activities.h"
#include "vrx/service/agent.h"

namespace vrx {
namespace {

using platform::BackgroundActivityResult;
using enum BackgroundActivityResult;

TEST(Outreach, SchedulesThePostForTheEarliestDueDate) {
    struct Case {
        const char* name;
        std::map<std::string, AgentWorld::Record> records{};  // of PHONE, and of watches
        std::optional<double> expected{};
    };
    const Case cases[] = {
        {.name = "no record"},
        {.name = "the earliest of three",
         .records = {{"PHONE", {.until = 300, .shownFrom = 10}},
                     {"V", {.until = 300, .shownFrom = 3}},
                     {"W", {.until = 300, .shownFrom = 20}}},
         .expected = 3},
        {.name = "a date in the past", .records = {{"PHONE", {.until = 60, .shownFrom = 1}}}, .expected = 1},
        {.name = "records without a date",
         .records = {{"PHONE", {}}, {"V", {.until = 300, .shownFrom = 10}}, {"W", {}}},
         .expected = 10},
        {.name = "an excluded carrier",
         .records = {{"PHONE", {.until = 300, .shownFrom = 10, .excludedCarrier = "310410"}},
                     {"W", {.until = 300, .shownFrom = 20, .excludedCarrier = "31041"}}},
         .expected = 20},
        {.name = "all on excluded carriers",
         .records = {{"PHONE", {.until = 300, .shownFrom = 10, .excludedCarrier = "310410"}}}},
    };
    for (const Case& c : cases) {
        AgentWorld world;
        world.host.telephony.carriers = {{"one", {"310", "410"}}, {"two", {{}, "31041"}}};
        for (const auto& [serialNumber, record] : c.records) {
            world.setRecord(serialNumber, record);
            if (serialNumber != "PHONE") world.pair(serialNumber, -30);
        }
        world.install();
        world.runToDay(1.999);
        EXPECT_EQ(world.runs("outreach"), 0);
        world.runToDay(2.001);
        EXPECT_EQ(world.runs("outreach"), 1) << c.name;
        EXPECT_EQ(world.target("outreach"), std::nullopt) << c.name;
        EXPECT_EQ(world.host.log.count("No devices eligible for followUp posts"), c.expected ? 0 : 1) << c.name;
        const std::string planned = "Complete activity and schedule followUp post for: ";
        EXPECT_EQ(world.host.log.lastMessage("Complete activity and schedule followUp post for: %@"),
                  c.expected ? planned + platform::describe(AgentWorld::day(*c.expected)) : "")
            << c.name;
    }
}

// A client asks for another run while one is under way: the first one's activity goes, and its result comes all the
// same, or there would be no second run.
TEST(Outreach, EndsWhenItsActivityIsReplacedMeanwhile) {
    AgentWorld world;
    world.setRecord("PHONE", {300, 10});
    world.install();
    world.runToDay(1);
    auto ask = [](VRXAgentProtocol& agent) { agent.scheduleOutreachWithReply([](bool) {}); };
    world.request(ask);
    world.host.runFor(Duration(2.05));
    EXPECT_EQ(world.target("followuppost"), std::nullopt);
    world.request(ask);
    world.host.runFor(Duration(20));
    EXPECT_EQ(world.target("followuppost"), 10);
    EXPECT_EQ(world.runs("outreach"), 2);
}

// On the last day the number of days changes no more, and the refresh that follows a post comes at once.
TEST(Post, OnTheLastDayIsRefreshedAtOnce) {
    AgentWorld world;
    world.setRecord("PHONE", {.until = 10.5, .shownFrom = 10});
    world.install();
    world.runToDay(10.01);
    EXPECT_THAT(world.shown(), ElementsAre("PHONE"));
    EXPECT_EQ(world.runs("followuprefresh"), 1);
}

// No devices, as soon as it is told so.
class SlowInventory final : public VRXAgentDeviceProvider {
public:
    std::shared_ptr<VRXDevice> defaultDevice() override { return nullptr; }
    DevicesBySerialNumber pairedDevices() override { return {}; }
    DevicesBySerialNumber allDevices() override {
        isReady->wait();
        return {};
    }
    std::shared_ptr<platform::Event> isReady = platform::Platform::current().queues().makeEvent();
};

class ActivityTest : public OnSimulatedHost {
protected:
    template <class Activity>
    std::shared_ptr<Activity> run(std::shared_ptr<VRXAgentProtocol> agent) {
        auto activity = std::make_shared<Activity>(
            ActivityCollaborators{[agent] { return agent; }, [] { return std::make_shared<VRXFollowUp>(); }});
        scheduler = VRXScheduler::newSchedulerWithActivityDelegate(activity);
        host.queues.workers(platform::Priority::Background).post([this] {
            scheduler->performScheduledOutreachWithBlock(
                [this](BackgroundActivityResult result) { results.push_back(result); });
        });
        host.runFor(Duration(2));
        return activity;
    }

    static constexpr Duration watchInterval{2e9};
    std::shared_ptr<VRXScheduler> scheduler;
    std::vector<BackgroundActivityResult> results;
};

TEST_F(ActivityTest, NeedsTheNetworkOnlyForDownloads) {
    const ActivityCollaborators none{};
    const std::pair<std::shared_ptr<VRXSchedulerActivityDelegate>, bool> activities[] = {
        {std::make_shared<VRXPostUpgradeActivity>(none), false},
        {std::make_shared<VRXPostBootActivity>(none), false},
        {std::make_shared<VRXOutreachActivity>(none), true},
        {std::make_shared<VRXFollowUpPost>(none), true},
        {std::make_shared<VRXFollowUpRefresh>(none), false}};
    for (const auto& [activity, needsNetwork] : activities) {
        VRXScheduler::newSchedulerWithActivityDelegate(activity)->scheduleActivityWithDelay(Duration(60));
        EXPECT_EQ(host.activities.criteria(activity->identifier()).value().requiresNetwork, needsNetwork)
            << activity->identifier();
    }
}

TEST_F(ActivityTest, IsDeferredWhenNoDeviceInfosCanBeLoaded) {
    run<VRXFollowUpPost>(nullptr);
    run<VRXFollowUpRefresh>(nullptr);
    EXPECT_THAT(results, ElementsAre(Deferred, Deferred));
    EXPECT_EQ(host.log.count("Unable to load devices info, defer"), 1);
    EXPECT_EQ(host.log.count("Unable to load device info for followup refresh, defer"), 1);
}

TEST_F(ActivityTest, EndsOnceWhetherItsWorkOrItsWatchComesFirst) {
    auto inventory = std::make_shared<SlowInventory>();
    auto agent = VRXAgent::initWithWarrantyProvider(nullptr, inventory);
    auto post = run<VRXFollowUpPost>(agent);
    host.runFor(watchInterval * 2.5);
    EXPECT_THAT(results, IsEmpty()) << "nobody asked it to defer";
    EXPECT_TRUE(post->followUpPostInProgress() && post->followUpPostTimer());
    host.activities.setShouldDefer(true);
    host.runFor(watchInterval * 0.75);
    EXPECT_THAT(results, ElementsAre(Deferred));
    EXPECT_FALSE(post->followUpPostInProgress() || post->followUpPostTimer());
    inventory->isReady->set();
    host.runFor(watchInterval * 2.0);
    EXPECT_EQ(host.log.count("%s -> %@"), 1) << "the reply came";
    EXPECT_THAT(results, ElementsAre(Deferred));

    run<VRXFollowUpPost>(agent);
    run<VRXFollowUpRefresh>(agent);
    host.runFor(watchInterval * 2.0);
    EXPECT_THAT(results, ElementsAre(Deferred, Finished, Finished));
}

TEST_F(ActivityTest, AnOutreachEndsOnceToo) {
    const Dictionary versions{{"LowServerVersion", 2}, {"HighServerVersion", 3}};
    host.defaults.registerDefaults(versions);
    host.defaults.set("ServerVersionOverride", versions);
    host.defaults.set("WarrantyURL", "https://coverage.example/summary");
    host.accounts.renewalDelay = watchInterval * 2.0;  // so long the downloads wait for a token
    host.activities.setShouldDefer(true);
    auto outreach = run<VRXOutreachActivity>(nullptr);
    EXPECT_TRUE(outreach->outreachInProgress() && outreach->outReachTimer());
    host.runFor(watchInterval * 1.5);
    EXPECT_THAT(results, ElementsAre(Deferred));
    EXPECT_FALSE(outreach->outreachInProgress() || outreach->outReachTimer());
    EXPECT_EQ(host.log.count("No devices eligible for followUp posts"), 0);
    host.runFor(watchInterval);
    EXPECT_EQ(host.log.count("No devices eligible for followUp posts"), 1) << "the downloads have ended";
    EXPECT_THAT(results, ElementsAre(Deferred));
}

}  // namespace
}  // namespace vrx
