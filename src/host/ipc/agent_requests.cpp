#include "vrx/host/ipc/agent_requests.h"

#include <cstring>
#include <utility>

#include "vrx/codec/core/keyed_archive.h"
#include "vrx/devices/records/device.h"
#include "vrx/devices/records/device_info.h"
#include "vrx/platform/limits.h"

namespace vrx::host {

using platform::Value;
using wire::OperationIndex;

namespace {

Value archived(bool value) {
    return value;
}

Value archived(const Value& value) {
    return codec::archiveValue(value);
}

Value archived(const std::optional<std::string>& text) {
    return text ? Value(*text) : Value();
}

template <class T>
Value archived(const std::shared_ptr<T>& object) {
    return object ? codec::archive(*object) : Value();
}

template <class T>
Value archived(const std::vector<std::shared_ptr<T>>& objects) {
    return codec::archive(objects);
}

// Serves as every Reply of the protocol.
class ArchivingReply {
public:
    explicit ArchivingReply(PendingReply reply) : reply_(std::move(reply)) {}
    template <class T>
    void operator()(const T& answer) {
        reply_.send(archived(answer));
    }

private:
    PendingReply reply_;
};

}  // namespace

std::optional<RequestArguments> readArguments(sd_bus_message* call, const wire::Operation& operation) {
    RequestArguments arguments;
    for (const char* type = operation.signature; *type != '\0'; ++type) {
        if (*type == 's') {
            const char* text = "";
            sd_bus_message_read_basic(call, *type, &text);
            if (std::strlen(text) > platform::limits::argumentBytes) return std::nullopt;
            arguments.text = text;
        } else if (*type == 't') {
            sd_bus_message_read_basic(call, *type, &arguments.policy);
        } else {
            int flag = 0;
            sd_bus_message_read_basic(call, *type, &flag);
            arguments.flag = flag != 0;
        }
    }
    return arguments;
}

void performRequest(VRXAgentProtocol& agent, OperationIndex operation, RequestArguments arguments,
                    PendingReply pendingReply) {
    ArchivingReply reply(std::move(pendingReply));
    auto& [text, policy, flag] = arguments;
    switch (operation) {
        case OperationIndex::ScheduleOutreach: return agent.scheduleOutreachWithReply(std::move(reply));
        case OperationIndex::CheckIsAvailableInStore:
            return agent.checkIsAvailableInStore(std::move(text), std::move(reply));
        case OperationIndex::AppSupportAvailability:
            return agent.appSupportAvailability(std::move(text), std::move(reply));
        case OperationIndex::ReadWebURLOverride: return agent.readWebURLOverride(std::move(reply));
        case OperationIndex::DefaultDevice: return agent.defaultDevice(std::move(reply));
        case OperationIndex::PairedDevices: return agent.pairedDevices(std::move(reply));
        case OperationIndex::GetDefaultDeviceInfo:
            return agent.getDefaultDeviceInfoUsingPolicy(policy, std::move(reply));
        case OperationIndex::GetDeviceInfoForSerialNumber:
            return agent.getDeviceInfoForSerialNumber(std::move(text), policy, std::move(reply));
        case OperationIndex::GetAllDeviceInfos:
            return agent.getAllDeviceInfosUsingPolicy(policy, flag, std::move(reply));
        case OperationIndex::DismissFollowUpForSerialNumber:
            return agent.dismissFollowUpForSerialNumber(std::move(text), std::move(reply));
    }
}

}  // namespace vrx::host
