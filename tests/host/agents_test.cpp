// The agent on the host's real queues: what races would show here, under the thread sanitizer.
#include <gtest/gtest.h>

#include <atomic>
#include <latch>

#include "coverage/warranty.h"
#include "devices/device_info.h"
#include "host/host.h"
#include "service/agent.h"
#include "service/register_defaults.h"
#include "support.h"

namespace vrx::host {
namespace {

TEST(Agents, AnswerOverlappingAllDevicesRequests) {
    TemporaryFolder folder;
    const HostLocations locations{folder / "home", folder / "device.toml"};
    writeFile(locations.profile,
              "[device]\nserial_number = 'PHONE'\n[account]\nidentifier = 'user'\n[features.Vireo]\nMeridian_3_0 "
              "= true\n"
              "[[watches]]\nname = 'One'\nserial_number = 'W1'\npaired = true\n"
              "[[watches]]\nname = 'Two'\nserial_number = 'W2'\npaired = true\n");
    writeFile(folder / "Warranty.plist", "<plist version='1.0'><dict><key>covered</key><true/></dict></plist>");
    writeFile(folder / "versions.plist",
              "<plist version='1.0'><dict><key>LowServerVersion</key><integer>2</integer><key>HighServerVersion</key>"
              "<integer>3</integer></dict></plist>");
    Host host(locations, platform::Level::Error);
    ASSERT_FALSE(host.open(HomeUse::Agent));
    auto& defaults = platform::Platform::current().defaultsStore();
    vrx_registerDefaults(defaults);
    defaults.set("WarrantyURL", "file://" + folder / "Warranty.plist");
    defaults.set("ServerVersionURL", "file://" + folder / "versions.plist");

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

}  // namespace
}  // namespace vrx::host
