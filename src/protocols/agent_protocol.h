// What the agent does for its clients: the interface that is exported over IPC. A request may come on any thread; its
// reply comes exactly once, on the same thread before the operation returns or later on another. No operation reports
// an error: what cannot be had is absent (a null pointer, null or nothing).
#pragma once

#include <optional>
#include <string>

#include "vrx/platform/task.h"
#include "vrx/platform/value.h"
#include "vrx/protocols/forward.h"

namespace vrx {

class VRXAgentProtocol {
public:
    template <class T>
    using Reply = platform::OnceCallback<T>;

    static constexpr std::string_view protocolName = "VRXAgentProtocol";

    virtual ~VRXAgentProtocol() = default;

    // Has an outreach run a second from now; true.
    virtual void scheduleOutreachWithReply(Reply<bool> reply) = 0;
    // Whether the Marketplace offers an application, and its data of it: a dictionary; null when it could not be asked.
    virtual void checkIsAvailableInStore(std::string bundleIdentifier, Reply<platform::Value> reply) = 0;
    // Whether an application is installed, was purchased or is offered: a dictionary.
    virtual void appSupportAvailability(std::string bundleIdentifier, Reply<platform::Value> reply) = 0;
    // The web-flow URL that a tester has set; nothing on customer builds. The reply may be empty.
    virtual void readWebURLOverride(Reply<std::optional<std::string>> reply) = 0;
    virtual void defaultDevice(Reply<std::shared_ptr<VRXDevice>> reply) = 0;
    virtual void pairedDevices(Reply<DeviceList> reply) = 0;
    // This device and its coverage record.
    virtual void getDefaultDeviceInfoUsingPolicy(VRXWarrantyLookupPolicy policy,
                                                 Reply<std::shared_ptr<VRXDeviceInfo>> reply) = 0;
    // The device of the serial number, one named "<unknown>" when there is none, and its coverage record.
    virtual void getDeviceInfoForSerialNumber(std::string serialNumber, VRXWarrantyLookupPolicy policy,
                                              Reply<std::shared_ptr<VRXDeviceInfo>> reply) = 0;
    // This device and every paired watch, in the order in which their records were had.
    virtual void getAllDeviceInfosUsingPolicy(VRXWarrantyLookupPolicy policy, bool updateFollowUps,
                                              Reply<DeviceInfoList> reply) = 0;
    // Takes the device's follow-up away for good; true.
    virtual void dismissFollowUpForSerialNumber(std::string serialNumber, Reply<bool> completion) = 0;
};

}  // namespace vrx
