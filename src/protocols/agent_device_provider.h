// Where an agent has its devices from. Each call asks afresh and gives new device objects; any thread may call it.
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
    // This device included.
    virtual DevicesBySerialNumber allDevices() = 0;
};

}  // namespace vrx
