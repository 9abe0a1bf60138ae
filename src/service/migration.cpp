// The one-time move of VRXAgent from the older layout, which had one record and one follow-up and named no device.

#include <utility>

#include "vrx/coverage/records/warranty.h"
#include "vrx/devices/records/device.h"
#include "vrx/devices/records/device_info.h"
#include "vrx/service/agent.h"

namespace vrx {

namespace {
constexpr std::int32_t currentMigrationVersion = 2;
}

void VRXAgent::performMigrationIfNeeded() {
    auto provider = warrantyProvider();
    if (provider->migrationVersion() >= currentMigrationVersion) return;
    auto device = deviceProvider()->defaultDevice();
    // The record first: it is what the follow-up is filled from.
    auto warranty = provider->migrateLegacyCachedWarrantyIfNeededForSerialNumber(device->serialNumber());
    provider->migrateLegacyFollowUpIfNeededWithDeviceInfo(
        VRXDeviceInfo::deviceInfoWithDevice(std::move(device), std::move(warranty)));
    // It is not tried again, whatever came of it.
    provider->setMigrationVersion(currentMigrationVersion);
}

}  // namespace vrx
