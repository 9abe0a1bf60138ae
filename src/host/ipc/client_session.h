// Serves one accepted client, on the thread that calls serve(), until the client goes or the service ends. Takes the
// next request when the operation of the one before has returned, and waits with it while too much is under way, or
// while the client does not take its replies. Sends replies as they come, from any thread. A request keeps the process
// alive until its reply is sent; a silent client does not.
#pragma once

#include <systemd/sd-bus.h>

#include <array>
#include <atomic>
#include <chrono>
#include <deque>
#include <memory>
#include <optional>
#include <unordered_map>

#include "vrx/host/ipc/agent_requests.h"
#include "vrx/host/ipc/host_requests.h"
#include "vrx/host/ipc/peer_identity.h"
#include "vrx/host/ipc/reply_box.h"
#include "vrx/host/ipc/request_line.h"
#include "vrx/host/ipc/server_bus.h"
#include "vrx/host/ipc/service_limits.h"
#include "vrx/host/loop/process_lifecycle.h"
#include "vrx/protocols/agent_protocol.h"
#include "vrx/wire/message.h"
#include "vrx/wire/names.h"

namespace vrx::host {

// What the thread that serves a session and the one that owns it tell each other. After a change of the first two the
// owner wakes the session's box.
struct SessionState {
    std::atomic<bool> isStopping = false;  // it is to end at once
    std::atomic<bool> isGivenUp = false;   // it is to end as soon as nothing is under way
    // Since when nothing is under way, by the steady clock; 0 while something is.
    std::atomic<std::chrono::steady_clock::rep> idleSince = 0;
    std::atomic<bool> isSubscribed = false;  // the client is told of changes
};

// What the sessions of one service share.
struct SessionSurroundings {
    const ServiceLimits& limits;
    RequestLine& line;
    ProcessLifecycle& lifecycle;
    HostRequests* host;  // null where the host answers nothing
};

class ClientSession final : public ReplySender {
public:
    ClientSession(Descriptor socket, const PeerIdentity& peer, std::shared_ptr<VRXAgentProtocol> agent,
                  std::shared_ptr<ReplyBox> box, const SessionSurroundings& surroundings);
    ~ClientSession() override;

    // The session has work in flight while the socket is read or closed.
    void serve(SessionState& state);

    void send(const RequestReply& reply) override;

private:
    // The handler's argument: an operation's own place among the interface's.
    struct Method {
        ClientSession* session;
        const wire::Operation* operation;
    };
    static constexpr std::size_t mostMethods = wire::operations.size() + wire::hostOperations.size() +
                                               wire::followUpsOperations.size() + wire::coverageOperations.size();
    template <const wire::Interface& interface>
    void serveInterface();
    static std::vector<sd_bus_vtable> tableOf(const wire::Interface& interface);
    static int onCall(sd_bus_message* call, void* method, sd_bus_error* error);
    static int onProperty(sd_bus*, const char*, const char*, const char* property, sd_bus_message* reply,
                          void* anyMethod, sd_bus_error*);
    int handle(sd_bus_message* call, const wire::Operation& operation, sd_bus_error* error);
    void perform(const wire::Operation& operation, RequestArguments arguments, PendingReply reply);
    bool isAllowed();
    bool subscribe(Changes::Kinds kinds, SessionState& state);
    void announceChanges();
    void announce(const wire::Interface& interface);
    void performWaiting();
    void countUnsent();
    bool isIdle() const { return openCalls_.empty() && bus_.unsentMessages() == 0; }
    bool waitUntilReady() const;
    bool isAuthenticationOverdue() const;

    struct Waiting {
        RequestNumber number;
        const wire::Operation* operation;
        RequestArguments arguments;
    };

    const PeerIdentity& peer_;
    const std::shared_ptr<VRXAgentProtocol> agent_;
    const std::shared_ptr<ReplyBox> box_;
    const ServiceLimits& limits_;
    RequestLine& line_;
    RequestLine::Waiter waiter_;
    ProcessLifecycle& lifecycle_;
    HostRequests* const host_;
    const std::chrono::steady_clock::time_point authenticationEnd_;
    platform::WorkInFlight work_;  // outlives the bus
    std::array<Method, mostMethods> methods_;
    std::size_t methodCount_ = 0;
    ServerBus bus_;
    RequestNumber lastRequest_ = 0;
    std::unordered_map<RequestNumber, wire::MessagePointer> openCalls_;
    std::deque<Waiting> waiting_;            // some of the open calls
    std::deque<std::size_t> unsentReplies_;  // bytes of each
    std::size_t unsentBytes_ = 0;
    bool hasSentMuch_ = false;  // since memory was given back
    bool isCutOff_ = false;
    Changes::Kinds subscribed_ = 0;
    const std::shared_ptr<std::atomic<Changes::Kinds>> news_ = std::make_shared<std::atomic<Changes::Kinds>>();
    Changes::Subscription subscription_;
    SessionState* state_ = nullptr;  // while it serves
};

}  // namespace vrx::host
