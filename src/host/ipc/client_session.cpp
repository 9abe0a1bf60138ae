#include "vrx/host/ipc/client_session.h"

#include <malloc.h>
#include <poll.h>
#include <sys/socket.h>

#include <cerrno>

#include "vrx/host/base/request_scope.h"
#include "vrx/host/base/requester.h"
#include "vrx/platform/log.h"
#include "vrx/wire/encoding.h"

namespace vrx::host {

using platform::Level;
using platform::log;
using wire::MessagePointer;

namespace {

// Replies above it leave memory behind that the allocator would keep.
constexpr std::size_t muchBytes = 1024 * 1024;

// The kind of change to which the operation subscribes; 0 for all others.
Changes::Kinds subscriptionOf(const wire::Operation& operation) {
    if (&operation == &wire::subscribeToFollowUps) return Changes::followUps;
    return &operation == &wire::subscribeToCoverage ? Changes::coverage : 0;
}

}  // namespace

ClientSession::ClientSession(Descriptor socket, const PeerIdentity& peer, std::shared_ptr<VRXAgentProtocol> agent,
                             std::shared_ptr<ReplyBox> box, const SessionSurroundings& surroundings)
    : peer_(peer),
      agent_(std::move(agent)),
      box_(std::move(box)),
      limits_(surroundings.limits),
      line_(surroundings.line),
      waiter_{peer.user(), [box = box_] { box->wake(); }},
      lifecycle_(surroundings.lifecycle),
      host_(surroundings.host),
      authenticationEnd_(std::chrono::steady_clock::now() + limits_.authentication),
      work_(lifecycle_.beginWorkUnlessEnding()),
      bus_(std::move(socket), peer.processIdentifier()) {
    serveInterface<wire::agentInterface>();
    if (host_) {
        serveInterface<wire::hostInterface>();
        serveInterface<wire::followUpsInterface>();
        serveInterface<wire::coverageInterface>();
    }
    box_->open(*this);
}

ClientSession::~ClientSession() {
    subscription_.reset();
    box_->close();
    line_.leave(waiter_);
    line_.changeUnsent(unsentBytes_, 0);
}

template <const wire::Interface& interface>
void ClientSession::serveInterface() {
    static const std::vector<sd_bus_vtable> table = tableOf(interface);  // the bus keeps no copy
    Method* const first = &methods_[methodCount_];
    for (const wire::Operation& operation : interface.operations) methods_[methodCount_++] = {this, &operation};
    if (bus_.bus()) sd_bus_add_object_vtable(bus_.bus(), nullptr, interface.path, interface.name, table.data(), first);
}

// An operation's offset selects its place among the methods; a property is handed the first one.
std::vector<sd_bus_vtable> ClientSession::tableOf(const wire::Interface& interface) {
    std::vector<sd_bus_vtable> rows{SD_BUS_VTABLE_START(0)};
    for (const wire::Operation& operation : interface.operations) {
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
    for (const wire::Property& property : interface.properties) {
        sd_bus_vtable row{};
        row.type = _SD_BUS_VTABLE_PROPERTY;
        row.x.property.member = property.name;
        row.x.property.signature = property.type;
        row.x.property.get = onProperty;
        rows.push_back(row);
    }
    if (interface.hasChangedSignal) {
        sd_bus_vtable row{};
        row.type = _SD_BUS_VTABLE_SIGNAL;
        row.x.signal.member = wire::changedMember;
        row.x.signal.signature = "";
        row.x.signal.names = "";
        rows.push_back(row);
    }
    rows.push_back(SD_BUS_VTABLE_END);
    return rows;
}

void ClientSession::serve(SessionState& state) {
    state_ = &state;
    while (true) {
        if (!work_) work_ = lifecycle_.beginWorkUnlessEnding();
        if (!work_) return;
        state.idleSince = 0;
        box_->sendPending();
        announceChanges();
        if (state.isStopping || isCutOff_ || isAuthenticationOverdue()) break;
        const ServerBus::Step step = bus_.step();
        if (step == ServerBus::Step::Ended) return;
        countUnsent();
        // What sd-bus answers by itself counts for nothing else.
        if (bus_.unsentMessages() > 2 * limits_.requestsPerConnection) break;
        performWaiting();
        if (step == ServerBus::Step::Progress) continue;
        if (isIdle()) {
            if (bus_.isReadToTheEnd()) break;
            if (state.isGivenUp) {
                shutdown(bus_.socket(), SHUT_RD);  // what has come until now is answered, and the rest not accepted
                continue;
            }
            state.idleSince = std::chrono::steady_clock::now().time_since_epoch().count();
        }
        if (bus_.unsentMessages() == 0 && waiting_.empty()) work_.reset();
        if (!waitUntilReady()) break;
    }
    if (!work_) work_ = lifecycle_.beginWorkUnlessEnding();
}

// Performs what has been read, in its order, as far as there are places for it. A client that has taken all its replies
// gets one more in any case.
void ClientSession::performWaiting() {
    while (!waiting_.empty() && unsentBytes_ < limits_.unsentBytesPerConnection) {
        RequestLine::Place place = line_.take(waiter_, unsentBytes_ > 0);
        if (!place) return;
        auto [number, operation, arguments] = std::move(waiting_.front());
        waiting_.pop_front();
        const RequesterScope requester(peer_.user());
        const RequestScope scope;
        perform(*operation, std::move(arguments), PendingReply(box_, number, agent_, {work_, std::move(place)}));
    }
}

void ClientSession::perform(const wire::Operation& operation, RequestArguments arguments, PendingReply reply) {
    if (const auto index = wire::indexOf(operation))
        performRequest(*agent_, *index, std::move(arguments), std::move(reply));
    else
        performHostRequest(*host_, *agent_, operation, std::move(arguments), std::move(reply));
}

// The bus tells how many messages it has not sent, not how large they are. Others than replies are small.
void ClientSession::countUnsent() {
    if (unsentBytes_ == 0) return;
    const std::size_t before = unsentBytes_;
    for (std::size_t left = bus_.unsentMessages(); unsentReplies_.size() > left; unsentReplies_.pop_front())
        unsentBytes_ -= unsentReplies_.front();
    line_.changeUnsent(before, unsentBytes_);
    if (unsentBytes_ == 0 && std::exchange(hasSentMuch_, false)) malloc_trim(0);
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
    return session->handle(call, *operation, error);
}

int ClientSession::onProperty(sd_bus*, const char*, const char*, const char* property, sd_bus_message* reply,
                              void* anyMethod, sd_bus_error*) {
    ClientSession& session = *static_cast<const Method*>(anyMethod)->session;
    return session.isAllowed() ? appendProperty(reply, *session.host_, property) : -EACCES;
}

// The peer may have executed another program since it was accepted.
bool ClientSession::isAllowed() {
    if (isCutOff_) return false;
    if (peer_.runsSameProgram()) return true;
    log(Level::Error, "Dropping connection from %d: it runs another program now", peer_.processIdentifier());
    isCutOff_ = true;
    return false;
}

bool ClientSession::subscribe(Changes::Kinds kinds, SessionState& state) {
    if (!subscription_)
        subscription_ = host_->subscribe(peer_.user(), [news = news_, box = box_](Changes::Kinds told) {
            news->fetch_or(told);
            box->wake();
        });
    if (!subscription_) return false;
    subscribed_ |= kinds;
    state.isSubscribed = true;
    return true;
}

// A client that has not taken what it was told before is told once for all changes meanwhile.
void ClientSession::announceChanges() {
    if (subscribed_ == 0 || bus_.unsentMessages() > 0) return;
    const Changes::Kinds kinds = news_->exchange(0) & subscribed_;
    if (kinds == 0 || !isAllowed()) return;
    if (kinds & Changes::followUps) announce(wire::followUpsInterface);
    if (kinds & Changes::coverage) announce(wire::coverageInterface);
}

void ClientSession::announce(const wire::Interface& interface) {
    if (sd_bus_emit_signal(bus_.bus(), interface.path, interface.name, wire::changedMember, "") < 0) isCutOff_ = true;
}

int ClientSession::handle(sd_bus_message* call, const wire::Operation& operation, sd_bus_error* error) {
    if (!isAllowed()) return 1;
    // Unread replies count as open requests.
    const std::size_t open = openCalls_.size() + bus_.unsentMessages();
    if (open >= limits_.requestsPerConnection) {
        isCutOff_ = open >= 2 * limits_.requestsPerConnection;
        return sd_bus_error_setf(error, wire::limitsExceeded, "more than %zu requests of this connection are open",
                                 limits_.requestsPerConnection);
    }
    platform::Result<RequestArguments> arguments = readArguments(call, bus_.body(), bus_.byteOrder(), operation);
    if (!arguments) return sd_bus_error_set(error, wire::invalidArguments, arguments.error().text.c_str());
    if (const Changes::Kinds kinds = subscriptionOf(operation); kinds && !subscribe(kinds, *state_))
        return sd_bus_error_setf(error, wire::limitsExceeded, "a user may have %zu subscriptions",
                                 Changes::mostOfOneUser);
    const RequestNumber request = ++lastRequest_;
    openCalls_.emplace(request, MessagePointer(sd_bus_message_ref(call)));
    waiting_.push_back({request, &operation, std::move(arguments).value()});
    return 1;
}

void ClientSession::send(const RequestReply& reply) {
    auto call = openCalls_.extract(reply.request);
    if (call.empty()) return;
    RequestScope::handOverLines();
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
    if (r >= 0 && bus_.unsentMessages() > 0) {
        unsentReplies_.push_back(wire::encodedBytes(*reply.root));
        line_.changeUnsent(unsentBytes_, unsentBytes_ + unsentReplies_.back());
        unsentBytes_ += unsentReplies_.back();
        hasSentMuch_ = hasSentMuch_ || unsentReplies_.back() >= muchBytes;
    }
    if (r < 0)
        r = sd_bus_reply_method_errorf(request, wire::limitsExceeded, "the reply cannot be sent: %s", strerror(-r));
    if (r < 0) isCutOff_ = true;  // else the client would wait for a reply that never comes
}

}  // namespace vrx::host
