// What start-up does, in its order, and once in the life of an installation.
#include "vrx/service/start_up.h"

#include "support/simulated_host.h"

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
    const std::string outreach = "com.orvane.vrxagent.outreach";
    for (const char* key : {"left over.TargetDate", "no.TargetDate.at all"}) host.defaults.set(key, "value");
    host.process.launch([] { return std::make_shared<StartUp>(); });
    host.runFor(Duration(1));
    EXPECT_TRUE(host.defaults.get("left over.TargetDate").isNull());
    EXPECT_FALSE(host.defaults.get("no.TargetDate.at all").isNull());
    EXPECT_EQ(host.defaults.date("DefaultDeviceActivationDate"), sim::Clock::start);
    EXPECT_EQ(host.activities.criteria(outreach), (platform::ActivityCriteria{172800, 17280, true}));

    host.process.agentVersion = "2";
    host.process.reboot(Duration(86400 * 3));
    host.runFor(Duration(0.5));
    EXPECT_EQ(host.log.count("post upgrade activity already performed"), 1);
    EXPECT_EQ(host.log.lastMessage("'%@' not complete, rescheduling"), "'" + outreach + "' not complete, rescheduling");
    EXPECT_EQ(host.activities.criteria(outreach), (platform::ActivityCriteria{0, 0, true}));
    host.runFor(Duration(60));
    host.process.reboot();
    host.runFor(Duration(60));
    EXPECT_EQ(host.log.count("'%@' not complete, rescheduling"), 1) << "it has run";
    EXPECT_EQ(host.activities.firingCount(outreach), 1);
}

}  // namespace
}  // namespace vrx
