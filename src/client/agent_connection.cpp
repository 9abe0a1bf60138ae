#include "vrx/client/agent_connection.h"

#include "vrx/client/caller.h"

namespace vrx::client {

using platform::Value;
using wire::OperationIndex;

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

}  // namespace vrx::client
