// The inventory: this device and the watches paired with it. It has no state: each call reads the platform afresh and
// returns new device objects. Any thread may call it. The dictionaries leave out a device without a serial number,
// because they have no key for it.
// A leading "_" is spelled so on purpose; "Names" in docs/architecture.md says why.
#pragma once

#include <memory>
#include <vector>

#include "vrx/platform/paired_device_registry.h"
#include "vrx/protocols/agent_device_provider.h"

namespace vrx {

class VRXDevicesManager final : public VRXAgentDeviceProvider {
public:
    // The manager that all agents share.
    static std::shared_ptr<VRXDevicesManager> sharedManager();

    std::shared_ptr<VRXDevice> defaultDevice() override;
    // Empty unless both this device and the coverage server support paired devices.
    DevicesBySerialNumber pairedDevices() override;
    DevicesBySerialNumber allDevices() override;

    // The watches of the registry that are paired and not archived.
    std::vector<platform::PairedWatch> _activePairedWatches() const;
};

}  // namespace vrx
