// The client library: the agent's operations for an application.
//
//     vrx::client::AgentConnection agent;
//     auto info = agent.getDeviceInfoForSerialNumber("F2LXK0ABCD", vrx::VRXWarrantyLookupPolicyDefault);
//     if (!info)
//         report(info.failure().text);             // the agent could not be asked
//     else if (auto warranty = (*info)->warranty())
//         show(warranty->coverageLocalizedLabel());  // else there is no coverage record for that device
//
// Each operation comes in two forms. The form without a callback waits on the calling thread and returns the answer or
// the reason why there is none. The form with one returns at once, and the callback gets the same later, on a thread of
// the library. It can be cancelled meanwhile.
//
// Threads: any number of threads may use one object at the same time. Each call under way uses a connection of its own,
// up to `connections`; only calls beyond that number wait for one another. Connections are opened when first needed and
// kept for later calls, so that making an object cannot fail.
//
// The agent may end while it has nothing to do. A call whose connection ended before its reply is sent again, once, on
// a new connection. All operations may be sent twice without harm.
//
// Texts and day counts of a VRXWarranty are derived when they are read. When the program has set no platform::Platform,
// the first object installs a small one: the system's clock, the locale of the process's environment, and a day of
// 86400 seconds. deriveAs() gives it the agent's own.
#pragma once

#include <memory>
#include <optional>
#include <string>

#include "vrx/client/answer.h"
#include "vrx/client/surroundings.h"
#include "vrx/coverage/records/warranty.h"
#include "vrx/devices/records/device.h"
#include "vrx/devices/records/device_info.h"
#include "vrx/platform/api.h"
#include "vrx/platform/value.h"
#include "vrx/protocols/forward.h"

namespace vrx::client {

class VRX_CLIENT_API AgentConnection final {
public:
    explicit AgentConnection(ConnectionOptions options = {});
    // Calls under way end as NotReachable, and no callback comes after the destructor has returned. It must not run
    // within a callback.
    ~AgentConnection();
    AgentConnection(const AgentConnection&) = delete;
    AgentConnection& operator=(const AgentConnection&) = delete;

    // These wait on the calling thread. docs/clients.md says what each returns.
    Answer<bool> scheduleOutreachWithReply();
    Answer<platform::Value> checkIsAvailableInStore(const std::string& bundleIdentifier);
    Answer<platform::Value> appSupportAvailability(const std::string& bundleIdentifier);
    Answer<std::optional<std::string>> readWebURLOverride();
    Answer<std::shared_ptr<VRXDevice>> defaultDevice();
    Answer<DeviceList> pairedDevices();
    Answer<std::shared_ptr<VRXDeviceInfo>> getDefaultDeviceInfoUsingPolicy(VRXWarrantyLookupPolicy policy);
    Answer<std::shared_ptr<VRXDeviceInfo>> getDeviceInfoForSerialNumber(const std::string& serialNumber,
                                                                        VRXWarrantyLookupPolicy policy);
    Answer<DeviceInfoList> getAllDeviceInfosUsingPolicy(VRXWarrantyLookupPolicy policy, bool updateFollowUps);
    Answer<bool> dismissFollowUpForSerialNumber(const std::string& serialNumber);

    // Changes nothing, and never waits for a server. BadReply from an agent that does not tell.
    Answer<Surroundings> surroundings();
    // Of the agent's process: docs/formats.md has the keys. Changes nothing either.
    Answer<platform::Value> status();

    // These answer later.
    Call scheduleOutreachWithReply(Callback<bool> callback);
    Call checkIsAvailableInStore(std::string bundleIdentifier, Callback<platform::Value> callback);
    Call appSupportAvailability(std::string bundleIdentifier, Callback<platform::Value> callback);
    Call readWebURLOverride(Callback<std::optional<std::string>> callback);
    Call defaultDevice(Callback<std::shared_ptr<VRXDevice>> callback);
    Call pairedDevices(Callback<DeviceList> callback);
    Call getDefaultDeviceInfoUsingPolicy(VRXWarrantyLookupPolicy policy,
                                         Callback<std::shared_ptr<VRXDeviceInfo>> callback);
    Call getDeviceInfoForSerialNumber(std::string serialNumber, VRXWarrantyLookupPolicy policy,
                                      Callback<std::shared_ptr<VRXDeviceInfo>> callback);
    Call getAllDeviceInfosUsingPolicy(VRXWarrantyLookupPolicy policy, bool updateFollowUps,
                                      Callback<DeviceInfoList> callback);
    Call dismissFollowUpForSerialNumber(std::string serialNumber, Callback<bool> callback);
    Call surroundings(Callback<Surroundings> callback);
    Call status(Callback<platform::Value> callback);

    // Texts and day counts of all records are derived with the agent's locale and day from now on, as its follow-ups
    // are. No effect in a program that has set a platform of its own. Any thread.
    static void deriveAs(const Surroundings& surroundings);

    const std::string& socketPath() const;
    platform::Duration timeLimit() const;

private:
    const std::unique_ptr<Caller> caller_;
};

}  // namespace vrx::client
