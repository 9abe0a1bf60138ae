// The names of the agent's service on the wire. It speaks D-Bus's protocol peer to peer over a Unix stream socket: one
// object with one interface, whose members are the operations of VRXAgentProtocol by their first keyword.
#pragma once

#include <array>
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

// Names of errors: the bus's own where one fits.
inline constexpr const char* accessDenied = "org.freedesktop.DBus.Error.AccessDenied";      // not entitled
inline constexpr const char* limitsExceeded = "org.freedesktop.DBus.Error.LimitsExceeded";  // too much at the same time
inline constexpr const char* invalidArguments = "org.freedesktop.DBus.Error.InvalidArgs";
inline constexpr const char* noReply = "org.freedesktop.DBus.Error.NoReply";  // the agent dropped the request

}  // namespace vrx::wire
