// What the agent does for its clients: the interface that is exported over IPC. A request may come on any thread; its
// reply comes exactly once, on the same thread before the operation returns or later on another. No operation reports
// an error: a result that is not available is null.
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

    // Schedules an outreach for a second from now; replies true.
    virtual void scheduleOutreachWithReply(Reply<bool> reply) = 0;
    // Whether the Marketplace offers an application, with the Marketplace's data about it: a dictionary, or null when
    // the Marketplace could not be asked.
    virtual void checkIsAvailableInStore(std::string bundleIdentifier, Reply<platform::Value> reply) = 0;
    // Whether an application is installed, was purchased or is offered: a dictionary.
    virtual void appSupportAvailability(std::string bundleIdentifier, Reply<platform::Value> reply) = 0;
    // The web-flow URL that a tester has set; always null on customer builds. The callback may be empty.
    virtual void readWebURLOverride(Reply<std::optional<std::string>> reply) = 0;
    virtual void defaultDevice(Reply<std::shared_ptr<VRXDevice>> reply) = 0;
    virtual void pairedDevices(Reply<DeviceList> reply) = 0;
    // This device and its coverage record.
    virtual void getDefaultDeviceInfoUsingPolicy(VRXWarrantyLookupPolicy policy,
                                                 Reply<std::shared_ptr<VRXDeviceInfo>> reply) = 0;
    // The device of the serial number, or one named "<unknown>" when the inventory has none, and its coverage record.
    virtual void getDeviceInfoForSerialNumber(std::string serialNumber, VRXWarrantyLookupPolicy policy,
                                              Reply<std::shared_ptr<VRXDeviceInfo>> reply) = 0;
    // This device and every paired watch, in the order in which the lookups of their records ended.
    virtual void getAllDeviceInfosUsingPolicy(VRXWarrantyLookupPolicy policy, bool updateFollowUps,
                                              Reply<DeviceInfoList> reply) = 0;
    // Removes the device's follow-up for good; replies true.
    virtual void dismissFollowUpForSerialNumber(std::string serialNumber, Reply<bool> completion) = 0;
};

}  // namespace vrx
