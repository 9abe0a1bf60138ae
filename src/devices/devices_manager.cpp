#include "vrx/devices/devices_manager.h"

#include <utility>

#include "vrx/devices/records/device.h"
#include "vrx/devices/utilities.h"
#include "vrx/platform/clock.h"
#include "vrx/platform/defaults_store.h"
#include "vrx/platform/device_properties.h"
#include "vrx/platform/log.h"
#include "vrx/platform/platform.h"
#include "vrx/platform/settings_keys.h"
#include "vrx/platform/text.h"
#include "vrx/serverversion/server_version_utilities.h"

namespace vrx {

using platform::Duration;
using platform::Level;
using platform::PairedWatch;
using platform::Platform;
using platform::Value;

namespace {

constexpr std::string_view serialNumberKey = "SerialNumber";
constexpr std::string_view deviceNameKey = "UserAssignedDeviceName";
constexpr std::string_view activationIntervalSuffix = ".activationInterval";
constexpr std::string_view featureDomain = "Vireo";
constexpr std::string_view pairedDevicesFlag = "Meridian_3_0";  // spelled so on purpose; log texts say "Meridian 3.0"

std::optional<std::string> defaultSerialNumber() {
    if (VRXUtilities::isInternal()) {
        auto override = Platform::current().defaultsStore().string(serialNumberKey);
        log(Level::Default, "default device SerialNumber Override = %{private}@", override);
        if (override) return override;
    }
    auto serialNumber = Platform::current().deviceProperties().string(serialNumberKey);
    log(Level::Default, "default device SerialNumber: '%{private}@'", serialNumber);
    return serialNumber;
}

void add(DevicesBySerialNumber& devices, std::shared_ptr<VRXDevice> device) {
    if (auto serialNumber = device->serialNumber()) devices.insert_or_assign(*serialNumber, std::move(device));
}

DevicesBySerialNumber testWatches(const platform::Dictionary& serialNumbers) {
    DevicesBySerialNumber watches;
    for (const auto& [key, value] : serialNumbers) {
        const std::string* serialNumber = value.asString();
        if (!serialNumber) continue;
        Duration interval(
            Platform::current().defaultsStore().number(*serialNumber + std::string(activationIntervalSuffix)));
        add(watches, VRXDevice::deviceWithName(platform::filled("DEBUG:%@", {*serialNumber}), *serialNumber,
                                               Platform::current().clock().now() + interval, VRXDeviceTypeWatch));
    }
    return watches;
}

DevicesBySerialNumber registryWatches(const std::vector<PairedWatch>& active) {
    DevicesBySerialNumber watches;
    for (const PairedWatch& watch : active)
        add(watches,
            VRXDevice::deviceWithName(watch.displayName(), watch.serialNumber, watch.pairedDate, VRXDeviceTypeWatch));
    return watches;
}

}  // namespace

std::shared_ptr<VRXDevicesManager> VRXDevicesManager::sharedManager() {
    static const auto manager = std::make_shared<VRXDevicesManager>();
    return manager;
}

std::shared_ptr<VRXDevice> VRXDevicesManager::defaultDevice() {
    auto serialNumber = defaultSerialNumber();
    auto name = Platform::current().deviceProperties().string(deviceNameKey);
    auto activationDate = Platform::current().defaultsStore().date(platform::settings::defaultDeviceActivationDate);
    return VRXDevice::deviceWithName(std::move(name), std::move(serialNumber), activationDate, VRXDeviceTypeDefault);
}

DevicesBySerialNumber VRXDevicesManager::pairedDevices() {
    if (!Platform::current().featureFlags().isEnabled(featureDomain, pairedDevicesFlag)) {
        log(Level::Default, "Meridian 3.0 disabled by feature flag, ignore paired devices");
        return {};
    }
    if (!VRXServerVersionUtilities::isHighServerVersionFeaturesetEnabled()) {
        log(Level::Default, "Meridian 3.0 disabled by server, ignore paired devices");
        return {};
    }
    Value tested = VRXUtilities::isInternal()
                       ? Platform::current().defaultsStore().dictionary(platform::settings::pairedWatchesSerialNumbers)
                       : Value();
    DevicesBySerialNumber devices =
        tested.asDictionary() ? testWatches(*tested.asDictionary()) : registryWatches(_activePairedWatches());
    log(Level::Default, "%s - %@", "-[VRXDevicesManager pairedDevices]", devices);
    return devices;
}

DevicesBySerialNumber VRXDevicesManager::allDevices() {
    DevicesBySerialNumber devices;
    add(devices, defaultDevice());
    for (auto& [serialNumber, device] : pairedDevices()) devices.insert_or_assign(serialNumber, device);
    return devices;
}

std::vector<PairedWatch> VRXDevicesManager::_activePairedWatches() const {
    std::vector<PairedWatch> watches = Platform::current().pairedDeviceRegistry().watches();
    std::erase_if(watches, [](const PairedWatch& watch) { return !watch.isActive(); });
    log(Level::Default, "%s -> pairedDevices: %@", "-[VRXDevicesManager _activePairedWatches]", watches);
    return watches;
}

}  // namespace vrx
