// Requests as they come from the bus, made into calls of VRXAgentProtocol, and its replies made into archives.
#pragma once

#include <systemd/sd-bus.h>

#include <optional>
#include <string>

#include "vrx/host/ipc/reply_box.h"
#include "vrx/protocols/agent_protocol.h"
#include "vrx/wire/names.h"

namespace vrx::host {

// An operation takes one of each at the most.
struct RequestArguments {
    std::string text;
    VRXWarrantyLookupPolicy policy = VRXWarrantyLookupPolicyDefault;
    bool flag = false;
};

// The arguments of a call whose signature is the operation's; nothing when a string is too long.
std::optional<RequestArguments> readArguments(sd_bus_message* call, const wire::Operation& operation);

// Calls the operation, which answers through the pending reply.
void performRequest(VRXAgentProtocol& agent, wire::OperationIndex operation, RequestArguments arguments,
                    PendingReply reply);

}  // namespace vrx::host
