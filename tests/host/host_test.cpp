#include "vrx/host/host.h"

#include <future>
#include <thread>

#include "host/bus/mock_bus.h"
#include "host/support.h"
#include "support/eventually.h"
#include "vrx/host/account/credential_helper.h"
#include "vrx/host/home/stored_facts.h"

namespace vrx::host {
namespace {

using platform::Platform;
using ::testing::MatchesRegex;

TEST(Host, IsTheCurrentPlatformAndHasItsHomeToItself) {
    TemporaryFolder folder;
    const HostLocations locations{folder / "state/home", {folder / "device.toml"}};
    writeFile(locations.profile.front(), "[locale]\ntime_zone = 'Asia/Kolkata'\nlanguage = 'de'\n");
    {
        Host agent(locations, platform::Level::Error);
        ASSERT_FALSE(agent.open(HomeUse::Agent));
        Platform& platform = Platform::current();
        EXPECT_EQ(platform.files().homeDirectory(), locations.home);
        EXPECT_EQ(platform.clock().timeZoneOffset(), 5h + 30min);
        writeFile(locations.profile.front(),
                  "[account]\nidentifier = 'ada'\ncredential_helper = ['/bin/sleep', '100000']\n"
                  "[locale]\ntime_zone = 'America/Lima'\n");
        EXPECT_EQ(platform.clock().timeZoneOffset(), -5h);
        const std::string uuid = platform.uuidSource().makeUuid();
        EXPECT_THAT(uuid, MatchesRegex("[0-9a-f]{8}(-[0-9a-f]{4}){3}-[0-9a-f]{12}"));
        EXPECT_NE(uuid, platform.uuidSource().makeUuid());
        const platform::MaybeError refusal = Host(locations).open(HomeUse::Agent);
        EXPECT_EQ(refusal->code, EWOULDBLOCK);
        EXPECT_THAT(refusal->text, HasSubstr("another agent (process " + std::to_string(getpid())));
        EXPECT_FALSE(Host(locations).open(HomeUse::Tool));
        EXPECT_EQ(&Platform::current(), &platform);

        // Work that still runs at the end has the platform to the last, and what it waits for ends.
        std::promise<void> begun;
        platform.queues().workers(platform::Priority::Background).post([&] {
            auto renewed = platform.queues().makeEvent();
            platform.accountStore().renewCredentials({"ada"}, {.services = {"S"}}, [&](const auto& result) {
                EXPECT_EQ(result.code, static_cast<int>(CredentialFailure::Ended));
                renewed->set();
            });
            begun.set_value();
            renewed->wait();
            for (int i = 0; i < 20; ++i) Platform::current().defaultsStore().set("key", i);
        });
        begun.get_future().wait();
    }
    EXPECT_FALSE(Platform::hasCurrent());
    Host next(locations);
    ASSERT_FALSE(next.open(HomeUse::Agent));
    EXPECT_EQ(Platform::current().defaultsStore().integer("key"), 19);
}

// On the real queues, with tools beside the agent: what races would show here, under the thread sanitizer.
TEST(Host, FiresActivitiesThatItsToolsAskFor) {
    TemporaryFolder folder;
    const HostLocations locations{folder / "home", {folder / "device.toml"}};
    Host agent(locations, platform::Level::Error);
    ASSERT_FALSE(Host(locations).open(HomeUse::Tool));
    EXPECT_EQ(*requestFiring(agent.home(), agent.database(), "a", 60s), std::nullopt) << "no agent has it";
    ASSERT_FALSE(agent.open(HomeUse::Agent));
    platform::BackgroundActivities& activities = Platform::current().backgroundActivities();
    std::atomic<int> runs = 0, fired = 0;
    auto handler = [&](platform::OnceCallback<platform::BackgroundActivityResult> completion) {
        ++runs;
        activities.schedule({.identifier = "other", .criteria{{.delay = 86400}}}, nullptr);
        completion(platform::BackgroundActivityResult::Finished);
    };
    for (const char* identifier : {"a", "b", "com.orvane.vrxagent.upgrade", "com.orvane.vrxagent.boot"})
        activities.schedule({.identifier = identifier, .isPreregistered = true}, handler);
    agent.start("1");

    std::vector<std::jthread> tools;
    for (const std::string identifier : {"a", "b", "a"})
        tools.emplace_back([&, identifier] {
            Database database(agent.home() + "/host.db");
            for (int i = 0; i < 10; ++i) {
                const std::optional<FiringAnswer> answer = *requestFiring(agent.home(), database, identifier, 60s);
                fired += answer == FiringAnswer::Fired;
                EXPECT_TRUE(answer == FiringAnswer::Fired || answer == FiringAnswer::AlreadyRunning);
            }
            EXPECT_EQ(storedFact(database, stored_facts::profile), locations.profile.front());
        });
    std::jthread last([&] {
        for (auto& tool : tools) tool.join();
        eventually([&] { return runs >= fired + 2; }, "a run for each that was fired");
        agent.mainLoop().stop();
    });
    agent.mainLoop().run();
    EXPECT_EQ(runs, fired + 2) << "the upgrade and the boot activity come by themselves";
    EXPECT_GT(fired, 0);
}

// A service that the machine's bus knows, on a thread of its own.
class ServedBus {
public:
    explicit ServedBus(const std::string& folder, const std::function<void(MockService&)>& prepare) : bus_(folder) {
        bus_.start();
        std::promise<void> isReady;
        thread_ = std::thread([&] {
            const EventLoop loop = makeEventLoop();
            MockService service(loop.get(), bus_);
            prepare(service);
            isReady.set_value();
            while (!isOver_) sd_event_run(loop.get(), 10'000);
        });
        isReady.get_future().wait();
    }
    ~ServedBus() {
        isOver_ = true;
        thread_.join();
    }
    std::string address() const { return bus_.address(); }

private:
    MockBus bus_;
    std::atomic<bool> isOver_ = false;
    std::thread thread_;
};

TEST(Host, KeepsTheSerialNumberThatAServiceTellsForItsMachine) {
    TemporaryFolder folder, root;
    writeFile(root / "etc/machine-id", "0123456789abcdef0123456789abcdef\n");
    const auto serialNumber = [&](std::optional<std::string> bus) {
        Host host({.home = folder / "home",
                   .profile = {folder / "device.toml"},
                   .systemBus = std::move(bus),
                   .machineRoot = root.path()},
                  platform::Level::Error);
        EXPECT_FALSE(host.open(HomeUse::Agent));
        return host.profile().string("SerialNumber");
    };
    const auto derived = serialNumber("unix:path=" + folder / "nobody");
    ServedBus bus(folder.path(), [](MockService& service) {
        service.methods["/org/freedesktop/hostname1 GetHardwareSerial"] = [](sd_bus_message*, sd_bus_message* reply) {
            sd_bus_message_append(reply, "s", "SERIAL7");
            return std::nullopt;
        };
        service.takeName("org.freedesktop.hostname1");
    });
    writeFile(folder / "device.toml", "[machine]\nsystem_bus = false\n");
    EXPECT_EQ(serialNumber(bus.address()), derived) << "the bus is off";
    writeFile(folder / "device.toml", "");
    EXPECT_EQ(serialNumber(bus.address()), "SERIAL7");
    EXPECT_EQ(serialNumber(std::nullopt), "SERIAL7") << "kept";
    writeFile(root / "etc/machine-id", "fedcba9876543210fedcba9876543210\n");
    EXPECT_NE(serialNumber(std::nullopt), "SERIAL7") << "on another machine";
    writeFile(root / "sys/class/dmi/id/product_serial", "FIRMWARE\n");
    EXPECT_EQ(serialNumber(bus.address()), "FIRMWARE");
}

}  // namespace
}  // namespace vrx::host
