// The source of an agent's devices. Each call reads the platform afresh and returns new device objects. Any thread may
// call it.
#pragma once

#include <map>
#include <memory>
#include <string>

#include "vrx/protocols/forward.h"

namespace vrx {

using DevicesBySerialNumber = std::map<std::string, std::shared_ptr<VRXDevice>, std::less<>>;

class VRXAgentDeviceProvider {
public:
    virtual ~VRXAgentDeviceProvider() = default;
    virtual std::shared_ptr<VRXDevice> defaultDevice() = 0;
    virtual DevicesBySerialNumber pairedDevices() = 0;
    // The paired devices and this device.
    virtual DevicesBySerialNumber allDevices() = 0;
};

}  // namespace vrx
