// The inventory of this device and its watches.
#include "vrx/devices/devices_manager.h"

#include "support/simulated_host.h"
#include "vrx/devices/records/device.h"

namespace vrx {
namespace {

using platform::PairedWatch;

class DevicesManagerTest : public OnSimulatedHost {
protected:
    DevicesManagerTest() {
        host.device.strings["SerialNumber"] = "REAL";
        host.device.strings["UserAssignedDeviceName"] = "Phone";
        host.flags.enabled = {{"Vireo", "Meridian_3_0"}};
        host.watches.all = {{"One", "Model", "W1", dateFromEpoch(5), true, false}};
        host.defaults.registerDefaults({{"LowServerVersion", 2}, {"HighServerVersion", 3}});
    }
    static std::vector<std::string> serialNumbers(const DevicesBySerialNumber& devices) {
        std::vector<std::string> numbers;
        for (const auto& [number, device] : devices) numbers.push_back(number);
        return numbers;
    }
    std::shared_ptr<VRXDevicesManager> manager = VRXDevicesManager::sharedManager();
};

TEST_F(DevicesManagerTest, ReportsThisDevice) {
    host.defaults.set("DefaultDeviceActivationDate", dateFromEpoch(100));
    host.defaults.set("SerialNumber", "TEST");
    auto device = manager->defaultDevice();
    EXPECT_EQ(device->description(), "Phone (REAL) (1970-01-01 00:01:40 +0000) - Default");
    EXPECT_NE(device, manager->defaultDevice());
    EXPECT_FALSE(host.log.contains("default device SerialNumber Override = %{private}@"));

    host.device.isInternal = true;
    EXPECT_EQ(manager->defaultDevice()->serialNumber(), "TEST");
    host.defaults.remove("SerialNumber");
    host.log.clear();
    EXPECT_EQ(manager->defaultDevice()->serialNumber(), "REAL");
    EXPECT_TRUE(host.log.contains("default device SerialNumber Override = %{private}@"));
    EXPECT_TRUE(host.log.contains("default device SerialNumber: '%{private}@'"));
}

TEST_F(DevicesManagerTest, ReportsActiveWatches) {
    auto watch = [](std::optional<std::string> name, std::optional<std::string> serial, bool paired, bool archived) {
        return PairedWatch{name, "Model", serial, dateFromEpoch(5), paired, archived};
    };
    host.watches.all = {watch("One", "W1", true, false),
                        watch(std::nullopt, "W2", true, false),
                        watch("Old", "W3", true, true),
                        watch("Gone", "W4", false, false),
                        watch("Nameless", std::nullopt, true, false),
                        watch("Again", "W1", true, false),
                        watch("Twin", "REAL", true, false)};
    auto paired = manager->pairedDevices();
    EXPECT_EQ(serialNumbers(paired), (std::vector<std::string>{"REAL", "W1", "W2"}));
    EXPECT_EQ(paired["W1"]->name(), "Again");
    EXPECT_EQ(paired["W2"]->name(), "Model");
    EXPECT_EQ(paired["W2"]->deviceType(), VRXDeviceTypeWatch);
    auto all = manager->allDevices();
    EXPECT_EQ(all.size(), 3u);
    EXPECT_EQ(all["REAL"]->name(), "Twin");
}

TEST_F(DevicesManagerTest, PairedDevicesNeedFlagAndServer) {
    host.defaults.set("ServerVersionCache", Dictionary{{"LowServerVersion", 2}, {"HighServerVersion", 2}});
    EXPECT_TRUE(manager->pairedDevices().empty());
    EXPECT_TRUE(host.log.contains("Meridian 3.0 disabled by server, ignore paired devices"));
    EXPECT_FALSE(host.log.contains("Meridian 3.0 disabled by feature flag, ignore paired devices"));
    host.log.clear();
    host.flags.enabled.clear();
    EXPECT_EQ(serialNumbers(manager->allDevices()), std::vector<std::string>{"REAL"});
    EXPECT_TRUE(host.log.contains("Meridian 3.0 disabled by feature flag, ignore paired devices"));
    EXPECT_FALSE(host.log.contains("Meridian 3.0 disabled by server, ignore paired devices"));
}

TEST_F(DevicesManagerTest, InternalBuildsTakeTestWatches) {
    host.defaults.set("PairedWatchesSerialNumbers", Dictionary{{"any", "T1"}, {"other", "T2"}, {"bad", 5}});
    host.defaults.set("T1.activationInterval", -86400);
    EXPECT_EQ(serialNumbers(manager->pairedDevices()), std::vector<std::string>{"W1"});
    host.device.isInternal = true;
    auto watches = manager->pairedDevices();
    EXPECT_EQ(serialNumbers(watches), (std::vector<std::string>{"T1", "T2"}));
    EXPECT_EQ(watches["T1"]->name(), "DEBUG:T1");
    EXPECT_EQ(watches["T1"]->activationDate(), host.clock.now() - Duration(86400));
    EXPECT_EQ(watches["T2"]->activationDate(), host.clock.now());
    host.defaults.set("PairedWatchesSerialNumbers", Dictionary{});
    EXPECT_TRUE(manager->pairedDevices().empty());
    host.defaults.set("PairedWatchesSerialNumbers", "no dictionary");
    EXPECT_EQ(serialNumbers(manager->pairedDevices()), std::vector<std::string>{"W1"});
}

}  // namespace
}  // namespace vrx
