// Serves one accepted client, on the thread that calls serve(), until the client goes or the service ends. Takes the
// next request when the operation of the one before has returned. Sends replies as they come, from any thread. A
// request keeps the process alive until its reply is sent; a silent client does not.
#pragma once

#include <systemd/sd-bus.h>

#include <array>
#include <atomic>
#include <memory>
#include <unordered_map>

#include "vrx/host/ipc/peer_identity.h"
#include "vrx/host/ipc/reply_box.h"
#include "vrx/host/ipc/server_bus.h"
#include "vrx/host/ipc/service_limits.h"
#include "vrx/host/loop/process_lifecycle.h"
#include "vrx/protocols/agent_protocol.h"
#include "vrx/wire/message.h"
#include "vrx/wire/names.h"

namespace vrx::host {

class ClientSession final : public ReplySender {
public:
    ClientSession(Descriptor socket, const PeerIdentity& peer, std::shared_ptr<VRXAgentProtocol> agent,
                  std::shared_ptr<ReplyBox> box, const ServiceLimits& limits, ProcessLifecycle& lifecycle);
    ~ClientSession() override;

    // To stop it, set the flag and wake the box. The session has work in flight while the socket is read or closed.
    void serve(const std::atomic<bool>& isStopping);

    void send(const RequestReply& reply) override;

private:
    // The handler's argument: an operation's own place among `methods_`.
    struct Method {
        ClientSession* session;
        wire::OperationIndex operation;
    };
    static const std::vector<sd_bus_vtable>& methodTable();
    static int onCall(sd_bus_message* call, void* method, sd_bus_error* error);
    int handle(sd_bus_message* call, wire::OperationIndex operation, sd_bus_error* error);
    bool waitUntilReady() const;
    bool isAuthenticationOverdue() const;

    const PeerIdentity& peer_;
    const std::shared_ptr<VRXAgentProtocol> agent_;
    const std::shared_ptr<ReplyBox> box_;
    const ServiceLimits& limits_;
    ProcessLifecycle& lifecycle_;
    const std::chrono::steady_clock::time_point authenticationEnd_;
    platform::WorkInFlight work_;  // outlives the bus
    std::array<Method, wire::operations.size()> methods_;
    ServerBus bus_;
    RequestNumber lastRequest_ = 0;
    std::unordered_map<RequestNumber, wire::MessagePointer> openCalls_;
    bool isCutOff_ = false;
};

}  // namespace vrx::host
