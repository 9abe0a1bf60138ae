// One connection to the agent, for one call at a time. It belongs to one thread; interrupt() may come from any.
#pragma once

#include <systemd/sd-bus.h>

#include <chrono>
#include <functional>
#include <string>
#include <variant>

#include "vrx/client/answer.h"
#include "vrx/platform/error.h"
#include "vrx/platform/value.h"
#include "vrx/protocols/agent_protocol.h"
#include "vrx/wire/names.h"

namespace vrx::client {

using Deadline = std::chrono::steady_clock::time_point;

// Each operation takes at most one of each.
struct CallArguments {
    std::string_view text = {};
    VRXWarrantyLookupPolicy policy = VRXWarrantyLookupPolicyDefault;
    bool flag = false;
};

// The connection ended before there was a reply.
struct ConnectionEnded {
    std::string text;
};

using CallResult = std::variant<platform::Value, Failure, ConnectionEnded>;

class AgentBus {
public:
    AgentBus() = default;
    ~AgentBus() { sd_bus_close_unref(bus_); }
    AgentBus(const AgentBus&) = delete;
    AgentBus& operator=(const AgentBus&) = delete;

    // Opens the socket. An error's text is for people; its code is ETIMEDOUT when no place came free in the agent's
    // queue. Only calls after this one may be interrupted.
    platform::MaybeError open(const std::string& socketPath, Deadline deadline);

    // Returns the archived root of the operation's reply, or the properties that it asks for. After any other result
    // the connection is useless.
    CallResult call(const wire::Operation& operation, const CallArguments& arguments, Deadline deadline,
                    const wire::Interface& interface = wire::agentInterface);

    // Whom to tell of signals, by their interface, within call() or listen(). Once, when it is open.
    void setOnChanged(std::function<void(std::string_view interface)> onChanged);
    // Takes signals until the connection ends or the wake file is readable.
    void listen(int wakeFile);

    // Ends the connection and the call under way.
    void interrupt() const;

private:
    int authenticate(Deadline deadline);
    static int onMessage(sd_bus_message* message, void* self, sd_bus_error*);
    int appendArguments(sd_bus_message* message, const char* signature, const CallArguments& arguments);

    sd_bus* bus_ = nullptr;
    int socket_ = -1;  // the bus's
    std::function<void(std::string_view)> onChanged_;
};

}  // namespace vrx::client
