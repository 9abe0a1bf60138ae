// The client library: the agent's operations for an application.
//
//     vrx::client::AgentConnection agent;
//     auto info = agent.getDeviceInfoForSerialNumber("F2LXK0ABCD", vrx::VRXWarrantyLookupPolicyDefault);
//     if (!info)
//         report(info.failure().text);             // the agent could not be asked
//     else if (auto warranty = (*info)->warranty())
//         show(warranty->coverageLocalizedLabel());  // else there is no coverage record for that device
//
// Each operation comes in two forms. The one without a reply waits on the calling thread and gives the answer or, in
// its place, why there is none. The one with a reply is VRXAgentProtocol's: it returns at once, and the reply comes
// later on a thread of the library; what cannot be had is absent there, and the failure handler is told why just
// before.
//
// Threads: any number of threads may use one object at the same time. Calls under way at the same time use a connection
// each, up to `connections`; connections are kept for later calls and are opened when first needed, so that making an
// object cannot fail. Calls do not wait for one another as long as there are that many.
//
// The agent may end while it has nothing to do: a call whose connection ended before its reply is sent again, once, on
// a new connection. All operations may be sent twice without harm.
//
// Texts and day counts of a VRXWarranty are derived where they are read. When the program has set no
// platform::Platform, the library installs a small one with the first object: the system's clock, the locale of the
// process's environment, and a day of 86400 seconds.
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

// Why the agent gave no answer.
struct Failure {
    enum class Kind {
        NotReachable,  // nobody answers at the socket, or the connection ended twice
        Refused,       // see Refusal
        TimedOut,      // no reply within the time limit; the agent may still do what was asked
        BadReply,      // the answer is not what the operation gives: agent and library do not fit each other
    };
    enum class Refusal {
        Entitlement,  // the caller does not hold it
        Limit,        // too much at a time: connections, requests, or the size of the reply
        Argument,     // one is too long, or no text
    };
    Kind kind;
    std::string text;                        // for people; of a refusal, the agent's own words
    Refusal refusal = Refusal::Entitlement;  // when it is one
};

// What the agent answered, or why it did not. The answer itself may be nothing, such as a null pointer. value() and
// failure() may only be asked for what is there.
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
    std::string socketPath = {};          // empty: where wire::findLocations() says
    platform::Duration timeLimit{420.0};  // of a call, in seconds: longer than any download of the agent
    std::size_t connections = 8;
};

class AgentConnection final : public VRXAgentProtocol {
public:
    // Told of each failed call that had a reply, on the thread of that reply; the operation goes by its name.
    using FailureHandler = std::function<void(std::string_view operation, const Failure& failure)>;

    explicit AgentConnection(ConnectionOptions options = {}, FailureHandler failureHandler = nullptr);
    // Calls under way end as NotReachable; no reply comes after the destructor has returned. Not from within a reply.
    ~AgentConnection() override;
    AgentConnection(const AgentConnection&) = delete;
    AgentConnection& operator=(const AgentConnection&) = delete;

    // Waiting on the calling thread. What each gives is told in protocols/agent_protocol.h.
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

    // Replying later.
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
