// What start-up does, in its order.
#include "service/start_up.h"

#include <gmock/gmock.h>

#include "sim/host.h"

namespace vrx {
namespace {

using testing::ElementsAre;

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
    EXPECT_EQ(host.defaults.integer("VRXMigrationVersion"), 2);
    EXPECT_EQ(host.defaults.integer("PostUpgradeOutreachDelay"), 172800);
    EXPECT_EQ(host.notifications.registrationCount(), 3u);
    EXPECT_EQ(host.listener.serviceName(), "com.orvane.vrxagent");
}

// The first process of an installation begins the agent's work, each boot takes it up, and nothing begins it again.
TEST(StartUp, BeginsTheAgentsWorkOnce) {
    sim::Host host;
    const std::string outreach = "com.orvane.vrxagent.outreach.TargetDate";
    host.defaults.set("left over.TargetDate", host.clock.now());
    host.process.launch([] { return std::make_shared<StartUp>(); });
    host.runFor(platform::Duration(1));
    EXPECT_TRUE(host.defaults.get("left over.TargetDate").isNull());
    EXPECT_EQ(host.defaults.date("DefaultDeviceActivationDate"), sim::Clock::start);
    EXPECT_EQ(host.defaults.date(outreach), sim::Clock::start + platform::Duration(172800));
    EXPECT_EQ(host.log.count("post upgrade activity hasn't yet been performed, skip boot activity"), 1);

    host.process.agentVersion = "2";
    host.process.reboot(platform::Duration(86400 * 3));
    host.runFor(platform::Duration(1));
    EXPECT_EQ(host.log.count("post upgrade activity already performed"), 1);
    EXPECT_EQ(host.defaults.date("DefaultDeviceActivationDate"), sim::Clock::start);
    EXPECT_EQ(host.log.lastMessage("'%@' not complete, rescheduling"),
              "'com.orvane.vrxagent.outreach' not complete, rescheduling");
    EXPECT_EQ(host.activities.criteria("com.orvane.vrxagent.outreach")->delay, 0);
    host.runFor(platform::Duration(60));
    EXPECT_TRUE(host.defaults.get(outreach).isNull()) << "it ran";
    host.log.clear();
    host.process.reboot();
    host.runFor(platform::Duration(60));
    EXPECT_EQ(host.log.count("scheduled '%@' with delay: %.02f (%@)"), 0) << "nothing is left to take up";
}

}  // namespace
}  // namespace vrx
