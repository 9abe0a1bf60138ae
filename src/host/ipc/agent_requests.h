// Turns requests from the bus into calls of VRXAgentProtocol and of the host, and their replies into archives.
#pragma once

#include <systemd/sd-bus.h>

#include <bit>
#include <string>
#include <string_view>

#include "vrx/host/ipc/host_requests.h"
#include "vrx/host/ipc/reply_box.h"
#include "vrx/platform/error.h"
#include "vrx/protocols/agent_protocol.h"
#include "vrx/wire/names.h"

namespace vrx::host {

// An operation takes at most one of each.
struct RequestArguments {
    std::string text;
    VRXWarrantyLookupPolicy policy = VRXWarrantyLookupPolicyDefault;
    bool flag = false;
};

// Reads the arguments of a call with the operation's signature. The body's bytes are given as well. An error when it
// does not hold the arguments and nothing else, or a string is too long.
platform::Result<RequestArguments> readArguments(sd_bus_message* call, std::string_view body, std::endian order,
                                                 const wire::Operation& operation);

// Calls the operation, which answers through the pending reply.
void performRequest(VRXAgentProtocol& agent, wire::OperationIndex operation, RequestArguments arguments,
                    PendingReply reply);

// The same for the host's own operations.
void performHostRequest(HostRequests& host, VRXAgentProtocol& agent, const wire::Operation& operation,
                        RequestArguments arguments, PendingReply reply);
// Appends the value of one of wire::coverageProperties. Returns a negative errno when that fails.
int appendProperty(sd_bus_message* message, const HostRequests& host, std::string_view property);

}  // namespace vrx::host
