#include "vrx/host/activities/machine_conditions.h"

#include <linux/rtnetlink.h>
#include <net/if.h>
#include <sched.h>
#include <sys/ioctl.h>
#include <sys/socket.h>

#include <map>

#include "host/support.h"
#include "support/eventually.h"
#include "vrx/host/activities/power_supply.h"
#include "vrx/host/loop/main_loop.h"

namespace vrx::host {
namespace {

TEST(PowerSupply, IsLowWhereEveryBatteryIsAndNothingElseFeedsTheMachine) {
    TemporaryFolder root;
    auto isLowWith = [&](const std::string& supply, std::map<const char*, const char*> attributes) {
        for (const auto& [name, value] : attributes)
            writeFile(root / ("sys/class/power_supply/" + supply + "/" + name), std::string(value) + "\n");
        return isOnLowBattery(root.path());
    };
    EXPECT_FALSE(isOnLowBattery(root.path()));
    EXPECT_FALSE(isLowWith("mouse", {{"type", "Battery"}, {"scope", "Device"}, {"status", "Discharging"}}));
    EXPECT_TRUE(isLowWith("first", {{"type", "Battery"}, {"status", "Discharging"}, {"capacity", "20"}}));
    EXPECT_FALSE(isLowWith("second", {{"type", "Battery"}, {"status", "Discharging"}, {"capacity", "21"}}));
    EXPECT_TRUE(isLowWith("second", {{"capacity_level", "Critical"}}));
    EXPECT_FALSE(isLowWith("second", {{"status", "Charging"}}));
    EXPECT_TRUE(isLowWith("second", {{"status", "Discharging"}}));
    EXPECT_TRUE(isLowWith("adapter", {{"type", "Mains"}, {"online", "0"}}));
    EXPECT_FALSE(isLowWith("adapter", {{"online", "1"}}));
}

// On the loopback interface.
void addDefaultRoute() {
    const Descriptor file(socket(AF_NETLINK, SOCK_RAW | SOCK_CLOEXEC, NETLINK_ROUTE));
    const Descriptor any(socket(AF_INET, SOCK_DGRAM | SOCK_CLOEXEC, 0));
    ifreq interface {};
    std::string("lo").copy(interface.ifr_name, 2);
    interface.ifr_flags = IFF_UP;
    ioctl(any.number(), SIOCSIFFLAGS, &interface);
    struct {
        nlmsghdr header{sizeof(*this), RTM_NEWROUTE, NLM_F_REQUEST | NLM_F_CREATE, 0, 0};
        rtmsg route{AF_INET, 0, 0, 0, RT_TABLE_MAIN, RTPROT_STATIC, RT_SCOPE_LINK, RTN_UNICAST, 0};
        rtattr attribute{RTA_LENGTH(sizeof(std::uint32_t)), RTA_OIF};
        std::uint32_t interface = if_nametoindex("lo");
    } request;
    send(file.number(), &request, sizeof request, 0);
}

// In a child: 0 is good, 77 that it may not have a network of its own.
int followRoutes() {
    if (unshare(CLONE_NEWUSER | CLONE_NEWNET) != 0) return 77;
    LogRecorder log;
    TemporaryFolder folder;
    MainLoop loop;
    DeviceProfile profile(folder / "device.toml");
    MachineServices services(loop.event());  // which nobody starts
    MachineConditions conditions(loop.event(), profile, services);
    int wakeUps = 0;
    conditions.start({.wake = [&] { ++wakeUps, loop.stop(); }, .wallClockSet = [] {}});
    if (conditions.isNetworkAvailable()) return 1;
    conditions.wakeAt(std::nullopt, {.network = true});
    loop.post([] { addDefaultRoute(); });
    loop.postAfter(std::chrono::minutes(1), [&] { loop.stop(); });
    const auto hasRoute = [&] { return conditions.isNetworkAvailable() || (loop.run(), false); };
    if (!eventually(hasRoute, "the route")) return 4;
    if (wakeUps == 0) return 2;
    writeFile(profile.layers().front(), "[network]\navailable = false\n");
    return conditions.isNetworkAvailable() ? 3 : 0;
}

TEST(MachineConditions, FollowTheDefaultRoutesAndTheProfile) {
    const int code = endOf(inChild([] { _exit(followRoutes()); }));
    if (code == 77) GTEST_SKIP() << "no network of its own here";
    EXPECT_EQ(code, 0);
}

}  // namespace
}  // namespace vrx::host
