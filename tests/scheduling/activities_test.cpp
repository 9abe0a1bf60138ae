// The activities one by one: what a run decides, and how it ends.
#include <gmock/gmock.h>

#include "followup/follow_up.h"
#include "scheduling/agent_world.h"
#include "scheduling/follow_up_post.h"
#include "scheduling/follow_up_refresh.h"
#include "scheduling/scheduler.h"

namespace vrx {
namespace {

using platform::BackgroundActivityResult;
using platform::Duration;
using testing::ElementsAre;
using testing::IsEmpty;
using enum BackgroundActivityResult;

TEST(Outreach, SchedulesThePostForTheEarliestDueDate) {
    struct Case {
        const char* name;
        std::map<std::string, AgentWorld::Record> records;  // of PHONE, and of watches
        std::optional<double> expected;
    };
    const Case cases[] = {
        {"no record", {}, {}},
        {"the earliest of three", {{"PHONE", {300, 10}}, {"V", {300, 3}}, {"W", {300, 20}}}, 3},
        {"the record's day wins over an earlier one", {{"PHONE", {60, 50, 30}}}, 50},
        {"before the end", {{"PHONE", {60, {}, 30}}}, 30},
        {"a date in the past", {{"PHONE", {60, 1}}}, 1},
        {"an excluded carrier", {{"PHONE", {300, 10, 0, "310410"}}, {"W", {300, 20, 0, "31041"}}}, 20},
        {"all on excluded carriers", {{"PHONE", {300, 10, 0, "310410"}}}, {}},
    };
    for (const Case& c : cases) {
        AgentWorld world;
        world.host.telephony.carriers = {{"one", {"310", "410"}}, {"two", {{}, "31041"}}};
        for (const auto& [serialNumber, record] : c.records) {
            world.setRecord(serialNumber, record);
            if (serialNumber != "PHONE") world.setPaired(serialNumber, -30);
        }
        world.install();
        world.runToDay(1.999);
        EXPECT_NEAR(*world.target("outreach"), 2, 1e-9);
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

// A record that asks for an offer without saying when leaves other devices' dates alone.
TEST(Outreach, TakesNoDateFromARecordThatHasNone) {
    AgentWorld world;
    for (const char* serialNumber : {"V", "W", "X"}) world.setPaired(serialNumber, -30);
    world.setRecord("W", {300, 10});
    auto data =
        world.host.propertyList
            .serialize(
                platform::Dictionary{{"featureToggleParameters", platform::Dictionary{{"qxOfferDisplay", true}}}},
                platform::PropertyListFormat::Binary)
            .value();
    for (const char* name : {"V", "X"})
        world.host.files.put(std::string("/data/W.") + name + ".plist", std::string(data.begin(), data.end()));
    world.install();
    world.runToDay(2.001);
    EXPECT_EQ(world.target("followuppost"), 10);
}

// A client asks for another run while one is under way: the first one's activity goes, and its result comes all the
// same, or there would be no second run.
TEST(Outreach, EndsWhenItsActivityIsReplacedMeanwhile) {
    AgentWorld world;
    world.setRecord("PHONE", {300, 10});
    world.install();
    world.runToDay(1);
    auto client = world.host.listener.connect(7, {{"com.orvane.private.vrxagent", true}});
    auto ask = [&] { client->request([](VRXAgentProtocol& agent) { agent.scheduleOutreachWithReply([](bool) {}); }); };
    ask();
    world.host.runFor(Duration(2.05));
    EXPECT_EQ(world.host.log.count("No devices eligible for followUp posts"), 0);
    ask();
    world.host.runFor(Duration(20));
    EXPECT_EQ(world.runs("outreach"), 1);
    EXPECT_EQ(world.target("followuppost"), 10);
    world.host.runFor(Duration(15 * 60));
    EXPECT_EQ(world.runs("outreach"), 2);
}

// An agent that answers when the test says so.
class HeldAgent final : public VRXAgentProtocol {
public:
    void getAllDeviceInfosUsingPolicy(VRXWarrantyLookupPolicy policy, bool updateFollowUps,
                                      Reply<DeviceInfoList> reply) override {
        asked.push_back(std::to_string(policy) + (updateFollowUps ? " and update" : ""));
        held = std::move(reply);
    }
    void scheduleOutreachWithReply(Reply<bool>) override {}
    void checkIsAvailableInStore(std::string, Reply<platform::Value>) override {}
    void appSupportAvailability(std::string, Reply<platform::Value>) override {}
    void readWebURLOverride(Reply<std::optional<std::string>>) override {}
    void defaultDevice(Reply<std::shared_ptr<VRXDevice>>) override {}
    void pairedDevices(Reply<DeviceList>) override {}
    void getDefaultDeviceInfoUsingPolicy(VRXWarrantyLookupPolicy, Reply<std::shared_ptr<VRXDeviceInfo>>) override {}
    void getDeviceInfoForSerialNumber(std::string, VRXWarrantyLookupPolicy,
                                      Reply<std::shared_ptr<VRXDeviceInfo>>) override {}
    void dismissFollowUpForSerialNumber(std::string, Reply<bool>) override {}

    std::vector<std::string> asked;
    Reply<DeviceInfoList> held;
};

class ActivityTest : public testing::Test {
protected:
    template <class Activity>
    std::shared_ptr<Activity> run(std::shared_ptr<VRXAgentProtocol> agent) {
        auto activity = std::make_shared<Activity>(
            ActivityCollaborators{[agent] { return agent; }, [] { return std::make_shared<VRXFollowUp>(); }});
        scheduler = VRXScheduler::newSchedulerWithActivityDelegate(activity);
        scheduler->performScheduledOutreachWithBlock(
            [this](BackgroundActivityResult result) { results.push_back(result); });
        return activity;
    }

    sim::Host host;
    std::shared_ptr<VRXScheduler> scheduler;
    std::vector<BackgroundActivityResult> results;
};

TEST_F(ActivityTest, IsDeferredWhenNoDeviceInfosCanBeLoaded) {
    auto post = run<VRXFollowUpPost>(nullptr);
    EXPECT_FALSE(post->followUpPostInProgress());
    EXPECT_FALSE(post->followUpPostTimer());
    run<VRXFollowUpRefresh>(nullptr);
    host.runFor(Duration(1));
    EXPECT_THAT(results, ElementsAre(Deferred, Deferred));
    EXPECT_THAT(host.log.messages(),
                testing::IsSupersetOf(
                    {"-[VRXFollowUpPost performActivityForScheduler:withCompletionHandler:] -> (null)",
                     "Unable to load devices info, defer", "Unable to load device info for followup refresh, defer"}));
}

TEST_F(ActivityTest, IsFinishedWithNothingToDoWhenThereAreNoDevices) {
    auto agent = std::make_shared<HeldAgent>();
    run<VRXFollowUpPost>(agent);
    agent->held({});
    run<VRXFollowUpRefresh>(agent);
    agent->held({});
    host.runFor(Duration(1));
    EXPECT_THAT(agent->asked, ElementsAre("2", "1"));
    EXPECT_THAT(results, ElementsAre(Finished, Finished));
    for (const char* name : {"followuppost", "followuprefresh"})
        EXPECT_EQ(host.activities.criteria(AgentWorld::activity(name)), std::nullopt);
}

TEST_F(ActivityTest, EndsOnceWhetherItsWorkOrItsWatchComesFirst) {
    constexpr Duration watchInterval{2e9};
    auto agent = std::make_shared<HeldAgent>();
    auto post = run<VRXFollowUpPost>(agent);
    host.runFor(watchInterval);
    EXPECT_THAT(results, IsEmpty()) << "nobody asked it to defer";
    EXPECT_TRUE(post->followUpPostInProgress() && post->followUpPostTimer());
    host.activities.setShouldDefer(true);
    host.runFor(watchInterval - Duration(1));
    EXPECT_THAT(results, IsEmpty());
    host.runFor(Duration(2));
    EXPECT_THAT(results, ElementsAre(Deferred));
    EXPECT_EQ(host.log.count("FollowUp Post activity deferred."), 1);
    EXPECT_FALSE(post->followUpPostInProgress() || post->followUpPostTimer());
    agent->held({});
    host.runFor(watchInterval * 2.0);
    EXPECT_THAT(results, ElementsAre(Deferred));

    run<VRXFollowUpPost>(agent);
    agent->held({});
    host.runFor(watchInterval * 2.0);
    EXPECT_THAT(results, ElementsAre(Deferred, Finished));
}

}  // namespace
}  // namespace vrx
