// The names of the agent's service on the wire. It speaks D-Bus's protocol peer to peer over a Unix stream socket: an
// object with the agent's interface, whose members are the operations of VRXAgentProtocol by their first keyword; and
// objects of the host, for what else an application wants to know of the agent.
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

struct Property {
    const char* name;
    const char* type;
};

struct Interface {
    const char* path;  // of its object
    const char* name;
    std::span<const Operation> operations;
    // Whether it has the signal "Changed", which says that what it tells of may be other now. It is sent to connections
    // that have called subscribeMember.
    bool hasChangedSignal = false;
    std::span<const Property> properties = {};
};

inline constexpr const char* changedMember = "Changed";
inline constexpr const char* subscribeMember = "subscribe";

inline constexpr Interface agentInterface{objectPath, interfaceName, operations};

// Of the process that runs the agent. Touches neither a record nor a follow-up.
inline constexpr std::array<Operation, 1> hostOperations{{{"status", "", "reply\0"}}};
inline constexpr const Operation& statusOperation = hostOperations[0];
inline constexpr Interface hostInterface{"/com/orvane/host", "com.orvane.AgentHost", hostOperations};

// What the settings app shows.
inline constexpr std::array<Operation, 3> followUpsOperations{{{"pendingFollowUps", "", "reply\0"},
                                                               {"dismissFollowUp", "s", "identifier\0reply\0"},
                                                               {subscribeMember, "", "reply\0"}}};
inline constexpr const Operation& pendingFollowUpsOperation = followUpsOperations[0];
inline constexpr const Operation& dismissFollowUpOperation = followUpsOperations[1];
inline constexpr const Operation& subscribeToFollowUps = followUpsOperations[2];
inline constexpr Interface followUpsInterface{"/com/orvane/followups", "com.orvane.FollowUps", followUpsOperations,
                                              true};

// That a record, a device or the language is another, and what the agent goes by.
inline constexpr std::array<Operation, 1> coverageOperations{{{subscribeMember, "", "reply\0"}}};
inline constexpr const Operation& subscribeToCoverage = coverageOperations[0];
// The locale; a day, in seconds; of each activity "identifier" (s), "state" (s) and, if it is scheduled, "due" (d, in
// seconds since 1970).
inline constexpr std::array<Property, 3> coverageProperties{
    {{"Locale", "s"}, {"OneDayInterval", "d"}, {"Activities", "aa{sv}"}}};
inline constexpr Interface coverageInterface{"/com/orvane/coverage", "com.orvane.Coverage", coverageOperations, true,
                                             coverageProperties};

// D-Bus's own interface of the same object, by which all of them are asked for at once.
inline constexpr std::array<Operation, 1> propertiesOperations{{{"GetAll", "s", "interface\0properties\0"}}};
inline constexpr const Operation& getAllProperties = propertiesOperations[0];
inline constexpr Interface coveragePropertiesInterface{coverageInterface.path, "org.freedesktop.DBus.Properties",
                                                       propertiesOperations};

constexpr bool isOurs(const Interface& interface) {
    return std::string_view(interface.name).starts_with(platform::vendorPrefix);
}
static_assert(isOurs(agentInterface) && isOurs(hostInterface) && isOurs(followUpsInterface) &&
              isOurs(coverageInterface));

// Names of errors: the bus's own where one fits.
inline constexpr const char* accessDenied = "org.freedesktop.DBus.Error.AccessDenied";      // not entitled
inline constexpr const char* limitsExceeded = "org.freedesktop.DBus.Error.LimitsExceeded";  // too much at the same time
inline constexpr const char* invalidArguments = "org.freedesktop.DBus.Error.InvalidArgs";
inline constexpr const char* noReply = "org.freedesktop.DBus.Error.NoReply";  // the agent dropped the request

}  // namespace vrx::wire
