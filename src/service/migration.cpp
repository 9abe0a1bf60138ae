// VRXAgent's one-time move from the older layout, which had one record and one follow-up and named no device.

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
    // The record first, because the follow-up is filled from it.
    auto warranty = provider->migrateLegacyCachedWarrantyIfNeededForSerialNumber(device->serialNumber());
    provider->migrateLegacyFollowUpIfNeededWithDeviceInfo(
        VRXDeviceInfo::deviceInfoWithDevice(std::move(device), std::move(warranty)));
    // Recorded whatever the outcome: the move is not tried again.
    provider->setMigrationVersion(currentMigrationVersion);
}

}  // namespace vrx
