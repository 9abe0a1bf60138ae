// The names of the agent's service on the wire. It speaks D-Bus's protocol peer to peer over a Unix stream socket: an
// object with the agent's interface, whose members are the operations of VRXAgentProtocol by their first keyword; and
// one with the host's, which tells of the process that runs the agent.
#pragma once

#include <array>
#include <optional>
#include <span>
#include <string_view>

#include "vrx/platform/vendor.h"

namespace vrx::wire {

inline constexpr const char* serviceName = "com.orvane.vrxagent";  // also the socket's file name
inline constexpr const char* objectPath = "/com/orvane/vrxagent";
inline constexpr const char* interfaceName = "com.orvane.VRXAgentProtocol";
static_assert(std::string_view(serviceName).starts_with(platform::vendorPrefix) &&
              std::string_view(serviceName).ends_with(platform::serviceNameRemainder) &&
              std::string_view(interfaceName).starts_with(platform::vendorPrefix));

// Every reply is one dictionary of the encoding (see encoding.h).
inline constexpr const char* replySignature = "a{sv}";

// Types of arguments: a string "s", a lookup policy "t", a flag "b".
struct Operation {
    const char* member;
    const char* signature;
    const char* argumentNames;  // each ends with a NUL, the last with two; the reply's is the last
};

enum class OperationIndex {
    ScheduleOutreach,
    CheckIsAvailableInStore,
    AppSupportAvailability,
    ReadWebURLOverride,
    DefaultDevice,
    PairedDevices,
    GetDefaultDeviceInfo,
    GetDeviceInfoForSerialNumber,
    GetAllDeviceInfos,
    DismissFollowUpForSerialNumber,
};

inline constexpr std::array<Operation, 10> operations{{
    {"scheduleOutreachWithReply", "", "reply\0"},
    {"checkIsAvailableInStore", "s", "bundleIdentifier\0reply\0"},
    {"appSupportAvailability", "s", "bundleIdentifier\0reply\0"},
    {"readWebURLOverride", "", "reply\0"},
    {"defaultDevice", "", "reply\0"},
    {"pairedDevices", "", "reply\0"},
    {"getDefaultDeviceInfoUsingPolicy", "t", "policy\0reply\0"},
    {"getDeviceInfoForSerialNumber", "st", "serialNumber\0policy\0reply\0"},
    {"getAllDeviceInfosUsingPolicy", "tb", "policy\0updateFollowUps\0reply\0"},
    {"dismissFollowUpForSerialNumber", "s", "serialNumber\0reply\0"},
}};

constexpr const Operation& operation(OperationIndex index) {
    return operations[static_cast<std::size_t>(index)];
}

// Null for an operation that is not the agent's.
constexpr std::optional<OperationIndex> indexOf(const Operation& operation) {
    for (std::size_t i = 0; i < operations.size(); ++i)
        if (&operations[i] == &operation) return static_cast<OperationIndex>(i);
    return std::nullopt;
}

struct Interface {
    const char* path;  // of its object
    const char* name;
    std::span<const Operation> operations;
};

inline constexpr Interface agentInterface{objectPath, interfaceName, operations};

// Answers at once, and touches neither a record nor a follow-up.
inline constexpr std::array<Operation, 1> hostOperations{{{"status", "", "reply\0"}}};
inline constexpr const Operation& statusOperation = hostOperations[0];
inline constexpr Interface hostInterface{"/com/orvane/host", "com.orvane.AgentHost", hostOperations};
static_assert(std::string_view(hostInterface.name).starts_with(platform::vendorPrefix));

// Names of errors: the bus's own where one fits.
inline constexpr const char* accessDenied = "org.freedesktop.DBus.Error.AccessDenied";      // not entitled
inline constexpr const char* limitsExceeded = "org.freedesktop.DBus.Error.LimitsExceeded";  // too much at the same time
inline constexpr const char* invalidArguments = "org.freedesktop.DBus.Error.InvalidArgs";
inline constexpr const char* noReply = "org.freedesktop.DBus.Error.NoReply";  // the agent dropped the request

}  // namespace vrx::wire
