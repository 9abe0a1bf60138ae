#include "vrx/host/bus/machine_services.h"

#include "host/bus/mock_bus.h"
#include "vrx/host/activities/machine_conditions.h"

namespace vrx::host {
namespace {

constexpr const char* networkPath = "/org/freedesktop/NetworkManager";
constexpr const char* networkName = "org.freedesktop.NetworkManager";
constexpr const char* powerPath = "/net/hadess/PowerProfiles";
constexpr const char* powerName = "net.hadess.PowerProfiles";

class MachineServicesTest : public BusTest {
protected:
    void runUntilConnectivity(Connectivity connectivity) {
        runUntil([&] { return services.connectivity() == connectivity; }, "the connectivity");
    }
    void beNetworkManager(MockService& service, std::uint32_t connectivity) {
        service.answerProperties(networkPath, [connectivity](sd_bus_message* reply) {
            MockService::appendProperty(reply, "Devices", "ao", 1, "/device");
            MockService::appendProperty(reply, "Connectivity", "u", connectivity);
        });
        service.takeName(networkName);
    }

    MachineServices services{loop.event(), bus.address()};
};

TEST_F(MachineServicesTest, TellWhatTheServicesSayAsLongAsTheyAreThere) {
    int changes = 0;
    services.setOnChange([&] { ++changes; });
    services.start();  // there is no bus yet
    EXPECT_EQ(services.connectivity(), Connectivity::Unknown);
    bus.start();
    {
        MockService network(loop.event(), bus);
        beNetworkManager(network, 2);
        runUntilConnectivity(Connectivity::Portal);
        EXPECT_EQ(changes, 1);
        network.emit(networkPath, networkName, "Connectivity", "u", 4u);
        runUntilConnectivity(Connectivity::Full);
        EXPECT_EQ(network.calls, 1) << "it is asked once";
        network.emit(networkPath, networkName, "Metered", "u", 3u);
        runUntil([&] { return services.isNetworkMetered(); }, "the price");
        network.leaveName(networkName);
        runUntilConnectivity(Connectivity::Unknown);
        EXPECT_FALSE(services.isNetworkMetered());
        network.takeName(networkName);
        runUntilConnectivity(Connectivity::Portal);

        bus.stop();
        runUntilConnectivity(Connectivity::Unknown);
    }
    bus.start();
    MockService network(loop.event(), bus), power(loop.event(), bus);
    beNetworkManager(network, 4);
    power.answerProperties(
        powerPath, [](sd_bus_message* reply) { MockService::appendProperty(reply, "ActiveProfile", "s", "balanced"); });
    power.takeName(powerName);
    runUntilConnectivity(Connectivity::Full);
    EXPECT_FALSE(services.isSavingPower());
    power.emit(powerPath, powerName, "ActiveProfile", "s", "power-saver");
    runUntil([&] { return services.isSavingPower(); }, "the profile");
}

TEST_F(MachineServicesTest, BelieveNobodyElseAndNothingBroken) {
    bus.start();
    services.start();
    MockService network(loop.event(), bus), liar(loop.event(), bus);
    beNetworkManager(network, 4);
    runUntilConnectivity(Connectivity::Full);
    services.setOnChange([&] { EXPECT_NE(services.connectivity(), Connectivity::None); });

    liar.emitToEach(networkPath, networkName, "Connectivity", "u", 1u);
    network.emit(networkPath, networkName, "Connectivity", "i", 1);
    network.emit(networkPath, networkName, "Connectivity", "s", "none");
    network.emit(networkPath, networkName, "Connectivity", "u", 99u);
    runUntilConnectivity(Connectivity::Unknown);
    network.emit(networkPath, "org.example.Other", "Connectivity", "u", 1u);
    network.emit(networkPath, networkName, "ConnectivityCheckEnabled", "b", 1);
    runUntil([&] { return services.isConnectivityChecked().has_value(); }, "whether it checks");
    EXPECT_EQ(services.connectivity(), Connectivity::Unknown);

    MockService another(loop.event(), bus);
    network.leaveName(networkName);
    another.methods[std::string(networkPath) + " GetAll"] = [](sd_bus_message*, sd_bus_message* reply) {
        sd_bus_message_append(reply, "i", 4);
        return std::nullopt;
    };
    another.takeName(networkName);
    runUntil([&] { return another.calls > 0; }, "the question");
    another.emit(networkPath, networkName, "Connectivity", "u", 2u);
    runUntilConnectivity(Connectivity::Portal);
}

TEST_F(MachineServicesTest, DecideWhetherThereIsANetwork) {
    bus.start();
    services.start();
    DeviceProfile profile(folder / "device.toml");
    MachineConditions conditions(loop.event(), profile, services);
    int wakeUps = 0;
    conditions.start({.wake = [&] { ++wakeUps; }, .wallClockSet = [] {}});
    MockService network(loop.event(), bus);
    beNetworkManager(network, 2);
    runUntilConnectivity(Connectivity::Portal);
    EXPECT_FALSE(conditions.isNetworkAvailable()) << "in a portal";
    conditions.wakeAt(std::nullopt, {.network = true});
    EXPECT_EQ(wakeUps, 0);
    network.emit(networkPath, networkName, "Connectivity", "u", 4u);
    runUntil([&] { return wakeUps > 0; }, "the end of the wait");
    EXPECT_TRUE(conditions.isNetworkAvailable());
    network.emit(networkPath, networkName, "Connectivity", "u", 3u);
    runUntilConnectivity(Connectivity::Limited);
    EXPECT_FALSE(conditions.isNetworkAvailable());

    EXPECT_FALSE(conditions.shouldDefer(true));
    network.emit(networkPath, networkName, "Metered", "u", 1u);
    runUntil([&] { return conditions.shouldDefer(true); }, "the price");
    EXPECT_FALSE(conditions.shouldDefer(false));
    writeFile(profile.layers().front(), "[network]\navailable = true\n[activities]\nshould_defer = false\n");
    EXPECT_TRUE(conditions.isNetworkAvailable());
    EXPECT_FALSE(conditions.shouldDefer(true));
}

}  // namespace
}  // namespace vrx::host
