#include "vrx/host/ipc/agent_requests.h"

#include <cerrno>
#include <cstring>
#include <utility>

#include "vrx/codec/core/keyed_archive.h"
#include "vrx/devices/records/device.h"
#include "vrx/devices/records/device_info.h"
#include "vrx/platform/limits.h"

namespace vrx::host {

namespace error_domain = platform::error_domain;
namespace limits = platform::limits;
using platform::Error;
using platform::Result;
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

// The bus has compared the signature; that the body holds what it promises shows only here. sd-bus looks neither at
// what follows the last argument nor at whether a flag is one: that is read from the bytes.
Result<RequestArguments> readArguments(sd_bus_message* call, std::string_view body, std::endian order,
                                       const wire::Operation& operation) {
    const Error isWrong{error_domain::wire, EBADMSG, "the request does not hold its arguments, and only them"};
    RequestArguments arguments;
    const char* text = "";
    std::size_t end = 0;  // of what was read
    const auto moveTo = [&end](std::size_t alignment) { end = (end + alignment - 1) / alignment * alignment; };
    for (const char* type = operation.signature; *type != '\0'; ++type) {
        int flag = 0;
        void* const argument = *type == 's'   ? static_cast<void*>(&text)
                               : *type == 't' ? static_cast<void*>(&arguments.policy)
                                              : static_cast<void*>(&flag);
        if (sd_bus_message_read_basic(call, *type, argument) <= 0) return isWrong;
        moveTo(*type == 't' ? 8 : 4);
        if (*type == 'b') {
            arguments.flag = flag != 0;
            const std::string_view yes(order == std::endian::little ? "\1\0\0\0" : "\0\0\0\1", 4);
            if (arguments.flag && body.substr(end, 4) != yes) return isWrong;
        }
        end += *type == 's' ? 4 + std::strlen(text) + 1 : *type == 't' ? 8 : 4;
    }
    if (end != body.size()) return isWrong;
    if (std::strlen(text) > limits::argumentBytes)
        return Error{error_domain::wire, EBADMSG,
                     "a string argument is longer than " + std::to_string(limits::argumentBytes) + " bytes"};
    arguments.text = text;
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

void performHostRequest(HostRequests& host, VRXAgentProtocol& agent, const wire::Operation& operation,
                        RequestArguments arguments, PendingReply pendingReply) {
    ArchivingReply reply(std::move(pendingReply));
    if (&operation == &wire::statusOperation) return reply(host.status());
    if (&operation == &wire::pendingFollowUpsOperation) return reply(host.pendingFollowUps());
    if (&operation == &wire::dismissFollowUpOperation)
        return host.dismissFollowUp(arguments.text, agent, std::move(reply));
    host.whenChangesAreTold(
        [reply = std::make_shared<ArchivingReply>(std::move(reply))] { (*reply)(true); });  // a subscription
}

int appendProperty(sd_bus_message* message, const HostRequests& host, std::string_view property) {
    if (property == wire::coverageProperties[0].name)
        return sd_bus_message_append(message, "s", host.localeIdentifier().c_str());
    if (property == wire::coverageProperties[1].name)
        return sd_bus_message_append(message, "d", host.oneDayInterval().count());
    int r = sd_bus_message_open_container(message, 'a', "a{sv}");
    for (const ActivityState& activity : host.activities()) {
        if (r >= 0) r = sd_bus_message_open_container(message, 'a', "{sv}");
        if (r >= 0) r = sd_bus_message_append(message, "{sv}", "identifier", "s", activity.identifier.c_str());
        if (r >= 0) r = sd_bus_message_append(message, "{sv}", "state", "s", activity.state.c_str());
        if (r >= 0 && activity.due)
            r = sd_bus_message_append(message, "{sv}", "due", "d", platform::epochSeconds(*activity.due));
        if (r >= 0) r = sd_bus_message_close_container(message);
    }
    return r < 0 ? r : sd_bus_message_close_container(message);
}

}  // namespace vrx::host
