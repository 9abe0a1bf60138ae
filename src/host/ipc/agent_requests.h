// Turns requests from the bus into calls of VRXAgentProtocol, and its replies into archives.
#pragma once

#include <systemd/sd-bus.h>

#include <optional>
#include <string>

#include "vrx/host/ipc/reply_box.h"
#include "vrx/protocols/agent_protocol.h"
#include "vrx/wire/names.h"

namespace vrx::host {

// An operation takes at most one of each.
struct RequestArguments {
    std::string text;
    VRXWarrantyLookupPolicy policy = VRXWarrantyLookupPolicyDefault;
    bool flag = false;
};

// Reads the arguments of a call with the operation's signature. Nothing when a string is too long.
std::optional<RequestArguments> readArguments(sd_bus_message* call, const wire::Operation& operation);

// Calls the operation, which answers through the pending reply.
void performRequest(VRXAgentProtocol& agent, wire::OperationIndex operation, RequestArguments arguments,
                    PendingReply reply);

}  // namespace vrx::host
