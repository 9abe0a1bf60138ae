// The agent on the host's real queues: what races would show here, under the thread sanitizer.
#include <future>
#include <latch>

#include "host/support.h"
#include "vrx/coverage/records/warranty.h"
#include "vrx/devices/records/device_info.h"
#include "vrx/host/host.h"
#include "vrx/scheduling/outreach_activity.h"
#include "vrx/scheduling/scheduler.h"
#include "vrx/service/agent.h"
#include "vrx/service/register_defaults.h"

namespace vrx::host {
namespace {

// A device with two watches, whose records come from files.
class Agents : public ::testing::Test {
protected:
    void SetUp() override {
        writeFile(folder_ / "device.toml",
                  "[device]\nserial_number = 'PHONE'\n[account]\nidentifier = 'user'\n[features.Vireo]\nMeridian_3_0 "
                  "= true\n[locale]\ntime_zone = 'UTC'\n"
                  "[[watches]]\nname = 'One'\nserial_number = 'W1'\npaired = true\n"
                  "[[watches]]\nname = 'Two'\nserial_number = 'W2'\npaired = true\n");
        writeRecord("Warranty", {{"covered", true}});
        writeRecord("versions", {{"LowServerVersion", 2}, {"HighServerVersion", 3}});
        ASSERT_FALSE(host_.open(HomeUse::Agent));
        vrx_registerDefaults(defaults());
        defaults().set("WarrantyURL", "file://" + folder_ / "Warranty.plist");
        defaults().set("ServerVersionURL", "file://" + folder_ / "versions.plist");
    }
    void writeRecord(const std::string& name, const Dictionary& entries) const {
        writeFile(folder_ / (name + ".plist"), propertyList(entries));
    }
    static platform::DefaultsStore& defaults() { return platform::Platform::current().defaultsStore(); }

private:
    TemporaryFolder folder_;
    Host host_{{.home = folder_ / "home", .profile = {folder_ / "device.toml"}}, platform::Level::Error};
};

TEST_F(Agents, AnswerOverlappingAllDevicesRequests) {
    constexpr int rounds = 10;
    const std::shared_ptr<VRXAgent> agents[] = {VRXAgent::initWithCallingProcessBundleID("one"),
                                                VRXAgent::initWithCallingProcessBundleID("two")};
    std::latch replies(rounds * 2 * 2);
    std::atomic<int> records = 0;
    for (int round = 0; round < rounds; ++round)
        for (const auto& agent : agents)
            for (VRXWarrantyLookupPolicy policy : {VRXWarrantyLookupPolicyRefresh, VRXWarrantyLookupPolicyDefault})
                agent->getAllDeviceInfosUsingPolicy(policy, true, [&](DeviceInfoList infos) {
                    for (const auto& info : infos) records += info->warranty() && info->warranty()->covered();
                    replies.count_down();
                });
    replies.wait();
    EXPECT_EQ(records, rounds * 2 * 2 * 3);
}

TEST_F(Agents, FindTheEarliestOfDatesThatComeAtOnce) {
    const Dictionary offer{{"qxOfferDisplay", true}};
    for (auto [serialNumber, date] : {std::pair("PHONE", 3000000000), {"W1", 2900000000}, {"W2", 2950000000}})
        writeRecord(std::string("Warranty.") + serialNumber,
                    {{"featureToggleParameters", offer}, {"qxOfferFollowupDisplayDate", date}});
    constexpr const char* targetDate = "com.orvane.vrxagent.followuppost.TargetDate";
    for (int round = 0; round < 20; ++round) {
        defaults().remove(targetDate);
        auto outreach = std::make_shared<VRXOutreachActivity>(ActivityCollaborators{});
        std::promise<platform::BackgroundActivityResult> result;
        outreach->performActivityForScheduler(VRXScheduler::newSchedulerWithActivityDelegate(outreach),
                                              [&](auto given) { result.set_value(given); });
        ASSERT_EQ(result.get_future().get(), platform::BackgroundActivityResult::Finished);
        ASSERT_EQ(defaults().date(targetDate), dateFromEpoch(2900000000));
    }
}

}  // namespace
}  // namespace vrx::host
