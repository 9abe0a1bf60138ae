// What start-up does, in its order, and once in the life of an installation: the move from the older single-device
// layout, and the beginning of the agent's work.
#include "vrx/service/start_up.h"

#include "support/simulated_host.h"
#include "vrx/coverage/records/warranty.h"

namespace vrx {
namespace {

TEST(StartUp, MakesItsPartsInAFixedOrder) {
    sim::Host host;
    host.followUps.pending("com.orvane.Vireo").push_back({.uniqueIdentifier = "com.orvane.Vireo"});
    host.log.lowest = platform::Level::Default;
    StartUp startUp;
    EXPECT_THAT(host.log.messages(),
                ElementsAre("launched", "monitorForScheduledActivity for 'com.orvane.vrxagent.upgrade'",
                            "monitorForScheduledActivity for 'com.orvane.vrxagent.boot'",
                            "monitorForScheduledActivity for 'com.orvane.vrxagent.outreach'",
                            "monitorForScheduledActivity for 'com.orvane.vrxagent.followuprefresh'",
                            "default device SerialNumber: 'SIM00000001'",
                            "+[VRXWarranty warrantyWithDictionary:serialNumber:] : 0",
                            "Clearing legacy followup, no legacy warranty was found.."));
    EXPECT_EQ(host.notifications.registrationCount(), 3u);
    EXPECT_EQ(host.listener.serviceName(), "com.orvane.vrxagent");
}

TEST(StartUp, BeginsTheAgentsWorkOnceAndTakesItUpAtEachBoot) {
    sim::Host host;
    const std::string outreach = "com.orvane.vrxagent.outreach", refresh = "com.orvane.vrxagent.followuprefresh";
    const std::string rescheduled = "' not complete, rescheduling";
    for (const char* key : {"left over.TargetDate", "no.TargetDate.at all"}) host.defaults.set(key, "value");
    host.process.launch([] { return std::make_shared<StartUp>(); });
    host.runFor(Duration(1));
    EXPECT_TRUE(host.defaults.get("left over.TargetDate").isNull());
    EXPECT_FALSE(host.defaults.get("no.TargetDate.at all").isNull());
    EXPECT_EQ(host.defaults.date("DefaultDeviceActivationDate"), sim::Clock::start);
    EXPECT_EQ(host.activities.criteria(outreach), (platform::ActivityCriteria{172800, 17280, true}));

    host.defaults.set(refresh + ".TargetDate", sim::Clock::start + Duration(86400 * 9));
    host.process.agentVersion = "2";
    host.process.reboot(Duration(86400 * 3));
    host.runFor(Duration(0.5));
    EXPECT_EQ(host.log.count("post upgrade activity already performed"), 1);
    EXPECT_THAT(host.log.messages(),
                testing::IsSupersetOf({"'" + outreach + rescheduled, "'" + refresh + rescheduled}));
    EXPECT_EQ(host.activities.criteria(refresh), (platform::ActivityCriteria{518399, 51839, false}));
    EXPECT_EQ(host.activities.criteria(outreach), (platform::ActivityCriteria{0, 0, true}));
    host.runFor(Duration(60));
    host.process.reboot();
    host.runFor(Duration(60));
    EXPECT_EQ(host.log.count("'%@' not complete, rescheduling"), 3) << "the outreach has run";
    EXPECT_EQ(host.activities.firingCount(outreach), 1);
}

TEST(Migration, HappensOnceWhateverCameOfIt) {
    constexpr std::size_t moves = 3, loses = 2, nothing = 0;  // what is asked of the follow-ups
    for (const auto& [stored, file, asked] : {std::tuple(Value(), "", moves),
                                              {0, "", moves},
                                              {1, "", moves},
                                              {-7, "", moves},
                                              {1, "damaged", loses},
                                              {2, "", nothing},
                                              {5, "", nothing},
                                              {std::int64_t{1} << 40, "", nothing}}) {
        SCOPED_TRACE(stored.description() + file);
        sim::Host host;
        auto& pending = host.followUps.pending("com.orvane.Vireo");
        pending = {{.uniqueIdentifier = "com.orvane.Vireo"}};
        host.followUps.fail(sim::FollowUpControllers::Request::Clear);
        VRXWarranty::initWithDictionary(Dictionary{{"qxLocalizedOfferLabel", "label"}})->cache();
        if (asked == loses) host.files.put(VRXWarranty::_legacyWarrantyPath(), file);
        host.defaults.set("VRXMigrationVersion", stored);
        for (int start = 0; start < 2; ++start) StartUp();
        EXPECT_EQ(host.followUps.asked().size(), asked);
        EXPECT_EQ(host.defaults.get("VRXMigrationVersion"), asked == nothing ? stored : Value(2));
        EXPECT_EQ(host.log.count("default device SerialNumber: '%{private}@'"), asked == nothing ? 0 : 1);
        EXPECT_EQ(host.files.contains(VRXWarranty::_legacyWarrantyPath()), asked != moves);
        EXPECT_EQ(pending.back().title.value_or(""), asked == moves ? "label" : "") << "that of the record";
    }
}

}  // namespace
}  // namespace vrx
