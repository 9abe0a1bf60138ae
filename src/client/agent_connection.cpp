#include "vrx/client/agent_connection.h"

#include <cmath>

#include "vrx/client/caller.h"
#include "vrx/client/local_platform.h"

namespace vrx::client {

using platform::Value;
using wire::OperationIndex;

namespace {

// D-Bus's operation wants the name of the interface whose properties they are.
constexpr CallArguments ofCoverage{.text = wire::coverageInterface.name};

std::vector<Activity> activitiesFrom(const Value& list) {
    std::vector<Activity> activities;
    if (!list.asArray()) return activities;
    for (const Value& entry : *list.asArray()) {
        const std::string *identifier = entry["identifier"].asString(), *state = entry["state"].asString();
        if (!identifier || !state) continue;
        Activity& activity = activities.emplace_back(Activity{*identifier, *state});
        if (const auto due = entry["due"].asNumber()) activity.due = platform::dateFromEpoch(*due);
    }
    return activities;
}

}  // namespace

template <>
struct Decoder<Surroundings> {
    static Answer<Surroundings> decode(const Value& properties) {
        const std::string* locale = properties[wire::coverageProperties[0].name].asString();
        const auto day = properties[wire::coverageProperties[1].name].asNumber();
        if (!locale || !day || !std::isfinite(*day)) return badReply("the agent does not tell what it goes by");
        return Surroundings{*locale, platform::Duration(*day),
                            activitiesFrom(properties[wire::coverageProperties[2].name])};
    }
};

AgentConnection::AgentConnection(ConnectionOptions options) : caller_(std::make_unique<Caller>(std::move(options))) {}

AgentConnection::~AgentConnection() = default;

const std::string& AgentConnection::socketPath() const {
    return caller_->socketPath();
}

platform::Duration AgentConnection::timeLimit() const {
    return caller_->timeLimit();
}

Answer<bool> AgentConnection::scheduleOutreachWithReply() {
    return caller_->call<bool>(wire::agentInterface, wire::operation(OperationIndex::ScheduleOutreach));
}

Answer<Value> AgentConnection::checkIsAvailableInStore(const std::string& bundleIdentifier) {
    return caller_->call<Value>(wire::agentInterface, wire::operation(OperationIndex::CheckIsAvailableInStore),
                                {.text = bundleIdentifier});
}

Answer<Value> AgentConnection::appSupportAvailability(const std::string& bundleIdentifier) {
    return caller_->call<Value>(wire::agentInterface, wire::operation(OperationIndex::AppSupportAvailability),
                                {.text = bundleIdentifier});
}

Answer<std::optional<std::string>> AgentConnection::readWebURLOverride() {
    return caller_->call<std::optional<std::string>>(wire::agentInterface,
                                                     wire::operation(OperationIndex::ReadWebURLOverride));
}

Answer<std::shared_ptr<VRXDevice>> AgentConnection::defaultDevice() {
    return caller_->call<std::shared_ptr<VRXDevice>>(wire::agentInterface,
                                                     wire::operation(OperationIndex::DefaultDevice));
}

Answer<DeviceList> AgentConnection::pairedDevices() {
    return caller_->call<DeviceList>(wire::agentInterface, wire::operation(OperationIndex::PairedDevices));
}

Answer<std::shared_ptr<VRXDeviceInfo>> AgentConnection::getDefaultDeviceInfoUsingPolicy(
    VRXWarrantyLookupPolicy policy) {
    return caller_->call<std::shared_ptr<VRXDeviceInfo>>(
        wire::agentInterface, wire::operation(OperationIndex::GetDefaultDeviceInfo), {.policy = policy});
}

Answer<std::shared_ptr<VRXDeviceInfo>> AgentConnection::getDeviceInfoForSerialNumber(const std::string& serialNumber,
                                                                                     VRXWarrantyLookupPolicy policy) {
    return caller_->call<std::shared_ptr<VRXDeviceInfo>>(wire::agentInterface,
                                                         wire::operation(OperationIndex::GetDeviceInfoForSerialNumber),
                                                         {.text = serialNumber, .policy = policy});
}

Answer<DeviceInfoList> AgentConnection::getAllDeviceInfosUsingPolicy(VRXWarrantyLookupPolicy policy,
                                                                     bool updateFollowUps) {
    return caller_->call<DeviceInfoList>(wire::agentInterface, wire::operation(OperationIndex::GetAllDeviceInfos),
                                         {.policy = policy, .flag = updateFollowUps});
}

Answer<bool> AgentConnection::dismissFollowUpForSerialNumber(const std::string& serialNumber) {
    return caller_->call<bool>(wire::agentInterface, wire::operation(OperationIndex::DismissFollowUpForSerialNumber),
                               {.text = serialNumber});
}

Answer<Surroundings> AgentConnection::surroundings() {
    return caller_->call<Surroundings>(wire::coveragePropertiesInterface, wire::getAllProperties, ofCoverage);
}

Answer<Value> AgentConnection::status() {
    return caller_->call<Value>(wire::hostInterface, wire::statusOperation);
}

Call AgentConnection::scheduleOutreachWithReply(Callback<bool> callback) {
    return caller_->callLater(wire::agentInterface, wire::operation(OperationIndex::ScheduleOutreach),
                              std::move(callback));
}

Call AgentConnection::checkIsAvailableInStore(std::string bundleIdentifier, Callback<Value> callback) {
    return caller_->callLater(wire::agentInterface, wire::operation(OperationIndex::CheckIsAvailableInStore),
                              std::move(callback), std::move(bundleIdentifier));
}

Call AgentConnection::appSupportAvailability(std::string bundleIdentifier, Callback<Value> callback) {
    return caller_->callLater(wire::agentInterface, wire::operation(OperationIndex::AppSupportAvailability),
                              std::move(callback), std::move(bundleIdentifier));
}

Call AgentConnection::readWebURLOverride(Callback<std::optional<std::string>> callback) {
    return caller_->callLater(wire::agentInterface, wire::operation(OperationIndex::ReadWebURLOverride),
                              std::move(callback));
}

Call AgentConnection::defaultDevice(Callback<std::shared_ptr<VRXDevice>> callback) {
    return caller_->callLater(wire::agentInterface, wire::operation(OperationIndex::DefaultDevice),
                              std::move(callback));
}

Call AgentConnection::pairedDevices(Callback<DeviceList> callback) {
    return caller_->callLater(wire::agentInterface, wire::operation(OperationIndex::PairedDevices),
                              std::move(callback));
}

Call AgentConnection::getDefaultDeviceInfoUsingPolicy(VRXWarrantyLookupPolicy policy,
                                                      Callback<std::shared_ptr<VRXDeviceInfo>> callback) {
    return caller_->callLater(wire::agentInterface, wire::operation(OperationIndex::GetDefaultDeviceInfo),
                              std::move(callback), {}, {.policy = policy});
}

Call AgentConnection::getDeviceInfoForSerialNumber(std::string serialNumber, VRXWarrantyLookupPolicy policy,
                                                   Callback<std::shared_ptr<VRXDeviceInfo>> callback) {
    return caller_->callLater(wire::agentInterface, wire::operation(OperationIndex::GetDeviceInfoForSerialNumber),
                              std::move(callback), std::move(serialNumber), {.policy = policy});
}

Call AgentConnection::getAllDeviceInfosUsingPolicy(VRXWarrantyLookupPolicy policy, bool updateFollowUps,
                                                   Callback<DeviceInfoList> callback) {
    return caller_->callLater(wire::agentInterface, wire::operation(OperationIndex::GetAllDeviceInfos),
                              std::move(callback), {}, {.policy = policy, .flag = updateFollowUps});
}

Call AgentConnection::dismissFollowUpForSerialNumber(std::string serialNumber, Callback<bool> callback) {
    return caller_->callLater(wire::agentInterface, wire::operation(OperationIndex::DismissFollowUpForSerialNumber),
                              std::move(callback), std::move(serialNumber));
}

Call AgentConnection::surroundings(Callback<Surroundings> callback) {
    return caller_->callLater(wire::coveragePropertiesInterface, wire::getAllProperties, std::move(callback),
                              std::string(ofCoverage.text));
}

Call AgentConnection::status(Callback<Value> callback) {
    return caller_->callLater(wire::hostInterface, wire::statusOperation, std::move(callback));
}

void AgentConnection::deriveAs(const Surroundings& surroundings) {
    setLocalSurroundings(surroundings.locale, surroundings.oneDayInterval);
}

}  // namespace vrx::client
