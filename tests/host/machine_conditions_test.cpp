#include "host/machine_conditions.h"

#include <gmock/gmock.h>
#include <linux/rtnetlink.h>
#include <net/if.h>
#include <sched.h>
#include <sys/ioctl.h>
#include <sys/socket.h>
#include <sys/wait.h>

#include <filesystem>

#include "host/main_loop.h"
#include "host/power_supply.h"
#include "support.h"

namespace vrx::host {
namespace {

using namespace std::chrono_literals;

TEST(PowerSupply, IsLowWhereEveryBatteryIsAndNothingElseFeedsTheMachine) {
    const std::string low = "type=Battery status=Discharging capacity=20", mouse = " scope=Device";
    const struct {
        std::vector<std::string> supplies;
        bool isLow;
    } cases[] = {{{}, false},
                 {{low}, true},
                 {{"type=Battery status=Discharging capacity=21"}, false},
                 {{"type=Battery status=Discharging capacity=50 capacity_level=Critical"}, true},
                 {{"type=Battery status=Charging capacity=5"}, false},
                 {{low, "type=Mains online=0"}, true},
                 {{low, "type=USB online=2"}, false},
                 {{low, "type=Battery status=Discharging capacity=80"}, false},
                 {{low, "type=Battery status=Discharging capacity=80" + mouse}, true},
                 {{low + mouse}, false},
                 {{"type=Battery"}, false}};
    for (const auto& [supplies, isLow] : cases) {
        TemporaryFolder root;
        for (std::size_t i = 0; i < supplies.size(); ++i) {
            const std::string folder = root / ("sys/class/power_supply/" + std::to_string(i));
            std::filesystem::create_directories(folder);
            std::istringstream words(supplies[i]);
            for (std::string word; words >> word;)
                writeFile(folder + "/" + word.substr(0, word.find('=')), word.substr(word.find('=') + 1) + "\n");
        }
        EXPECT_EQ(isOnLowBattery(root.path()), isLow) << ::testing::PrintToString(supplies);
    }
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
    MachineConditions conditions(loop.event(), profile);
    int wakeUps = 0;
    conditions.start({.wake = [&] { ++wakeUps, loop.stop(); }, .wallClockSet = [] {}});
    if (conditions.isNetworkAvailable()) return 1;
    conditions.wakeAt(std::nullopt, true);
    loop.post([] { addDefaultRoute(); });
    while (!conditions.isNetworkAvailable()) loop.run();
    if (wakeUps == 0) return 2;
    writeFile(profile.path(), "[network]\navailable = false\n");
    return conditions.isNetworkAvailable() ? 3 : 0;
}

TEST(MachineConditions, FollowTheDefaultRoutesAndTheProfile) {
    const pid_t child = fork();
    if (child == 0) _exit(followRoutes());
    int status = 0;
    waitpid(child, &status, 0);
    ASSERT_TRUE(WIFEXITED(status));
    if (WEXITSTATUS(status) == 77) GTEST_SKIP() << "no network of its own here";
    EXPECT_EQ(WEXITSTATUS(status), 0);
}

TEST(MachineConditions, WakeAtTheTimeAskedForLast) {
    LogRecorder log;
    TemporaryFolder folder;
    MainLoop loop;
    DeviceProfile profile(folder / "device.toml");
    MachineConditions conditions(loop.event(), profile);
    std::optional<platform::Duration> woken;
    conditions.start({.wake = [&] { woken = conditions.now().sinceBoot, loop.stop(); }, .wallClockSet = [] {}});
    const platform::Duration due = conditions.now().sinceBoot + 5ms;
    conditions.wakeAt(platform::Duration(0), false);
    conditions.wakeAt(platform::Duration(1e300), false);
    conditions.wakeAt(due, false);
    loop.run();
    ASSERT_TRUE(woken);
    EXPECT_GE(*woken, due);

    EXPECT_EQ(conditions.minimumInterval(), 15min);
    writeFile(profile.path(), "[activities]\nminimum_interval = 2.5\nshould_defer = true\n");
    EXPECT_EQ(conditions.minimumInterval(), 2.5s);
    EXPECT_TRUE(conditions.shouldDefer());
    writeFile(profile.path(), "[activities]\nminimum_interval = 86400\n");
    EXPECT_EQ(conditions.minimumInterval(), 15min);
}

}  // namespace
}  // namespace vrx::host
