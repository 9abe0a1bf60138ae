#include "vrx/host/ipc/client_session.h"

#include <poll.h>

#include <cerrno>

#include "vrx/host/ipc/agent_requests.h"
#include "vrx/platform/log.h"
#include "vrx/wire/encoding.h"

namespace vrx::host {

using platform::Level;
using platform::log;
using wire::MessagePointer;

ClientSession::ClientSession(Descriptor socket, const PeerIdentity& peer, std::shared_ptr<VRXAgentProtocol> agent,
                             std::shared_ptr<ReplyBox> box, const ServiceLimits& limits, ProcessLifecycle& lifecycle)
    : peer_(peer),
      agent_(std::move(agent)),
      box_(std::move(box)),
      limits_(limits),
      lifecycle_(lifecycle),
      authenticationEnd_(std::chrono::steady_clock::now() + limits.authentication),
      work_(lifecycle.beginWorkUnlessEnding()),
      bus_(std::move(socket), peer.processIdentifier()) {
    for (std::size_t i = 0; i < methods_.size(); ++i) methods_[i] = {this, static_cast<wire::OperationIndex>(i)};
    if (bus_.bus())
        sd_bus_add_object_vtable(bus_.bus(), nullptr, wire::objectPath, wire::interfaceName, methodTable().data(),
                                 methods_.data());
    box_->open(*this);
}

ClientSession::~ClientSession() {
    box_->close();
}

// One row for each operation; its offset selects the operation's place among `methods_`.
const std::vector<sd_bus_vtable>& ClientSession::methodTable() {
    static const std::vector<sd_bus_vtable> table = [] {
        std::vector<sd_bus_vtable> rows{SD_BUS_VTABLE_START(0)};
        for (const wire::Operation& operation : wire::operations) {
            sd_bus_vtable row{};
            row.type = _SD_BUS_VTABLE_METHOD;
            row.flags = SD_BUS_VTABLE_UNPRIVILEGED;
            row.x.method.member = operation.member;
            row.x.method.signature = operation.signature;
            row.x.method.result = wire::replySignature;
            row.x.method.handler = onCall;
            row.x.method.offset = sizeof(Method) * (rows.size() - 1);
            row.x.method.names = operation.argumentNames;
            rows.push_back(row);
        }
        rows.push_back(SD_BUS_VTABLE_END);
        return rows;
    }();
    return table;
}

void ClientSession::serve(const std::atomic<bool>& isStopping) {
    while (!isStopping && !isCutOff_ && !isAuthenticationOverdue()) {
        if (!work_) work_ = lifecycle_.beginWorkUnlessEnding();
        if (!work_) return;
        box_->sendPending();
        const ServerBus::Step step = bus_.step();
        if (step == ServerBus::Step::Ended) return;
        if (step == ServerBus::Step::Progress) continue;
        if (bus_.unsentMessages() == 0) work_.reset();
        if (!waitUntilReady()) break;
    }
    if (!work_) work_ = lifecycle_.beginWorkUnlessEnding();
}

bool ClientSession::isAuthenticationOverdue() const {
    return !bus_.isAuthenticated() && std::chrono::steady_clock::now() >= authenticationEnd_;
}

bool ClientSession::waitUntilReady() const {
    using namespace std::chrono;
    int timeout = -1;
    if (!bus_.isAuthenticated()) {
        const auto left = ceil<milliseconds>(authenticationEnd_ - steady_clock::now());
        timeout = static_cast<int>(std::max(left, milliseconds(0)).count());
    }
    std::array<pollfd, 2> files{{{bus_.socket(), bus_.events(), 0}, {box_->wakeFile(), POLLIN, 0}}};
    return poll(files.data(), files.size(), timeout) >= 0 || errno == EINTR;
}

int ClientSession::onCall(sd_bus_message* call, void* method, sd_bus_error* error) {
    const auto& [session, operation] = *static_cast<const Method*>(method);
    return session->handle(call, operation, error);
}

// The peer may have executed another program since it was accepted: checked before each request.
int ClientSession::handle(sd_bus_message* call, wire::OperationIndex operation, sd_bus_error* error) {
    if (!peer_.runsSameProgram()) {
        log(Level::Error, "Dropping connection from %d: it runs another program now", peer_.processIdentifier());
        isCutOff_ = true;
        return 1;
    }
    // Unread replies count as open requests.
    const std::size_t open = openCalls_.size() + bus_.unsentMessages();
    if (open >= limits_.requestsPerConnection) {
        isCutOff_ = open >= 2 * limits_.requestsPerConnection;
        return sd_bus_error_setf(error, wire::limitsExceeded, "more than %zu requests of this connection are open",
                                 limits_.requestsPerConnection);
    }
    std::optional<RequestArguments> arguments = readArguments(call, wire::operation(operation));
    if (!arguments)
        return sd_bus_error_setf(error, wire::invalidArguments, "a string argument is longer than %zu bytes",
                                 platform::limits::argumentBytes);
    const RequestNumber request = ++lastRequest_;
    openCalls_.emplace(request, MessagePointer(sd_bus_message_ref(call)));
    performRequest(*agent_, operation, std::move(*arguments), PendingReply(box_, request, agent_, work_));
    return 1;
}

void ClientSession::send(const RequestReply& reply) {
    auto call = openCalls_.extract(reply.request);
    if (call.empty()) return;
    sd_bus_message* const request = call.mapped().get();
    if (!reply.root) {
        sd_bus_reply_method_errorf(request, wire::noReply, "the agent gave the request up");
        return;
    }
    sd_bus_message* message = nullptr;
    int r = sd_bus_message_new_method_return(request, &message);
    const MessagePointer owner(message);
    if (r >= 0) r = wire::appendReply(message, *reply.root);
    if (r >= 0) r = sd_bus_send(bus_.bus(), message, nullptr);
    if (r < 0) sd_bus_reply_method_errorf(request, wire::limitsExceeded, "the reply cannot be sent: %s", strerror(-r));
}

}  // namespace vrx::host
