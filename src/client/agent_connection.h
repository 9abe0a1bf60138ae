// The client library: the agent's operations for an application.
//
//     vrx::client::AgentConnection agent;
//     auto info = agent.getDeviceInfoForSerialNumber("F2LXK0ABCD", vrx::VRXWarrantyLookupPolicyDefault);
//     if (!info)
//         report(info.failure().text);             // the agent could not be asked
//     else if (auto warranty = (*info)->warranty())
//         show(warranty->coverageLocalizedLabel());  // else there is no coverage record for that device
//
// Each operation comes in two forms. The form without a reply waits on the calling thread and returns the answer or the
// reason why there is none. The form with a reply is VRXAgentProtocol's: it returns at once, and the reply comes later
// on a thread of the library. An answer that is not available is null there, and just before the reply the failure
// handler gets the reason.
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
// 86400 seconds.
#pragma once

#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <utility>
#include <variant>

#include "vrx/coverage/records/warranty.h"
#include "vrx/devices/records/device.h"
#include "vrx/devices/records/device_info.h"
#include "vrx/protocols/agent_protocol.h"

namespace vrx::client {

// Why there is no answer.
struct Failure {
    enum class Kind {
        NotReachable,  // no agent answers at the socket, or the connection ended twice
        Refused,       // see Refusal
        TimedOut,      // no reply within the time limit; the agent may still do what was asked
        BadReply,      // the answer is not of the operation's type: agent and library do not fit each other
    };
    enum class Refusal {
        Entitlement,  // the caller does not hold the entitlement
        Limit,        // too many connections or requests at the same time, or a reply that is too large
        Argument,     // an argument is too long, or is not text
    };
    Kind kind;
    std::string text;                        // for people; after a refusal, the agent's own words
    Refusal refusal = Refusal::Entitlement;  // only when the kind is Refused
};

// The agent's answer, or why there is none. The answer itself may be null. Callers may ask value() and failure() only
// for what is there.
template <class T>
class Answer {
public:
    Answer(T value) : content_(std::in_place_index<0>, std::move(value)) {}
    Answer(Failure failure) : content_(std::in_place_index<1>, std::move(failure)) {}

    explicit operator bool() const { return content_.index() == 0; }
    const T& value() const { return std::get<0>(content_); }
    const T& operator*() const { return value(); }
    const T* operator->() const { return &value(); }
    const Failure& failure() const { return std::get<1>(content_); }

private:
    std::variant<T, Failure> content_;
};

struct ConnectionOptions {
    std::string socketPath = {};          // empty: that of wire::findAgent(), once
    platform::Duration timeLimit{420.0};  // the limit of a call; longer than any download of the agent
    std::size_t connections = 8;
};

class AgentConnection final : public VRXAgentProtocol {
public:
    // Called for each failed call that had a reply, on the thread of that reply, with the operation's name.
    using FailureHandler = std::function<void(std::string_view operation, const Failure& failure)>;

    explicit AgentConnection(ConnectionOptions options = {}, FailureHandler failureHandler = nullptr);
    // Calls under way end as NotReachable, and no reply comes after the destructor has returned. It must not run within
    // a reply.
    ~AgentConnection() override;
    AgentConnection(const AgentConnection&) = delete;
    AgentConnection& operator=(const AgentConnection&) = delete;

    // These wait on the calling thread. protocols/agent_protocol.h says what each returns.
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

    // These reply later.
    void scheduleOutreachWithReply(Reply<bool> reply) override;
    void checkIsAvailableInStore(std::string bundleIdentifier, Reply<platform::Value> reply) override;
    void appSupportAvailability(std::string bundleIdentifier, Reply<platform::Value> reply) override;
    void readWebURLOverride(Reply<std::optional<std::string>> reply) override;
    void defaultDevice(Reply<std::shared_ptr<VRXDevice>> reply) override;
    void pairedDevices(Reply<DeviceList> reply) override;
    void getDefaultDeviceInfoUsingPolicy(VRXWarrantyLookupPolicy policy,
                                         Reply<std::shared_ptr<VRXDeviceInfo>> reply) override;
    void getDeviceInfoForSerialNumber(std::string serialNumber, VRXWarrantyLookupPolicy policy,
                                      Reply<std::shared_ptr<VRXDeviceInfo>> reply) override;
    void getAllDeviceInfosUsingPolicy(VRXWarrantyLookupPolicy policy, bool updateFollowUps,
                                      Reply<DeviceInfoList> reply) override;
    void dismissFollowUpForSerialNumber(std::string serialNumber, Reply<bool> completion) override;

    const std::string& socketPath() const;
    platform::Duration timeLimit() const;

private:
    class Implementation;
    std::unique_ptr<Implementation> implementation_;
};

}  // namespace vrx::client
