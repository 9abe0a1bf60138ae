#include "vrx/host/ipc/service_listener.h"

#include <malloc.h>
#include <sys/socket.h>

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <list>
#include <map>
#include <system_error>
#include <tuple>

#include "vrx/host/base/files.h"
#include "vrx/host/base/repeated_line.h"
#include "vrx/host/ipc/refusals.h"
#include "vrx/host/ipc/request_line.h"
#include "vrx/host/ipc/service_connection.h"
#include "vrx/host/loop/event_source.h"
#include "vrx/platform/log.h"
#include "vrx/wire/names.h"

namespace vrx::host {

using platform::Level;
using platform::log;
using platform::Result;

class ServiceListenerFactory::Listener final : public platform::ServiceListener {
public:
    Listener(sd_event* loop, int socket, const BundleLookup& bundles, ProcessLifecycle& lifecycle,
             const ServiceLimits& limits, HostRequests* host)
        : loop_(loop),
          socket_(socket),
          bundles_(bundles),
          lifecycle_(lifecycle),
          limits_(limits),
          refusals_(limits),
          endedFile_(makeEventFile()),
          line_(limits),
          surroundings_{limits, line_, lifecycle, host},
          restTimer_(addBootTimer(loop, onRested, this)) {
        endedSource_ = addReadSource(loop_, endedFile_.number(), onEnded, this);
        lifecycle_.setUnreadQuestion([this] { return readLast(); });
    }

    ~Listener() override {
        lifecycle_.setUnreadQuestion(nullptr);
        acceptSource_.reset();
        endedSource_.reset();
        for (auto& connection : connections_) connection->stop();
        connections_.clear();
    }

    void setDelegate(platform::ServiceListenerDelegate* delegate) override { delegate_ = delegate; }
    void resume() override { acceptSource_ = addReadSource(loop_, socket_, onIncoming, this); }

private:
    static int onIncoming(sd_event_source*, int, std::uint32_t, void* self) {
        static_cast<Listener*>(self)->acceptAll();
        return 0;
    }

    static int onEnded(sd_event_source*, int file, std::uint32_t, void* self) {
        eventfd_t count;
        eventfd_read(file, &count);
        static_cast<Listener*>(self)->removeEnded();
        return 0;
    }

    void removeEnded() {
        const auto ended = std::erase_if(connections_, [](auto& connection) { return connection->hasEnded(); });
        // Returns freed memory to the system: the next client may be long in coming.
        if (ended > 0 && connections_.empty()) malloc_trim(0);
    }

    // Each connection has to be asked: none takes more after that.
    bool readLast() const {
        return std::ranges::count_if(connections_, [](const auto& connection) { return connection->readsLast(); }) > 0;
    }

    void acceptAll() {
        while (true) {
            Descriptor client(accept4(socket_, nullptr, nullptr, SOCK_CLOEXEC | SOCK_NONBLOCK));
            if (client)
                take(std::move(client));
            else if (isShortage(errno))
                return rest();
            else if (errno != ECONNABORTED && errno != EINTR)
                return;
        }
    }

    // Clients wait in the socket's queue meanwhile. Watched on, it would wake the loop without end.
    void rest() {
        shortage_.write(Level::Error, std::string("Clients have to wait: ") + std::strerror(errno));
        sd_event_source_set_enabled(acceptSource_.get(), SD_EVENT_OFF);
        armTimer(restTimer_, bootTime() + std::chrono::seconds(1));
    }

    static int onRested(sd_event_source*, std::uint64_t, void* self) {
        sd_event_source_set_enabled(static_cast<Listener*>(self)->acceptSource_.get(), SD_EVENT_ON);
        return 0;
    }

    // A refused client gets no thread of its own.
    void take(Descriptor client) {
        Result<PeerIdentity> peer = PeerIdentity::ofPeer(client.number());
        if (!peer) {
            const Result<ucred> credentials = PeerIdentity::credentialsOf(client.number());
            if (credentials && isShortage(peer.error().code))
                refuseForNow(std::move(client), *credentials, "too much at the same time: " + peer.error().text);
            return;  // else it has already ended
        }
        removeEnded();
        const ucred credentials = peer->credentials();
        std::unique_ptr<ServiceConnection> connection;
        try {
            connection =
                std::make_unique<ServiceConnection>(std::move(client), std::move(peer).value(), bundles_, surroundings_,
                                                    [this] { eventfd_write(endedFile_.number(), 1); });
            const BundleLookup::Acceptance acceptance(connection->peer());
            if (!delegate_->shouldAcceptNewConnection(*this, *connection) || !connection->isResumed())
                return refusals_.refuse(connection->takeSocket(), credentials, wire::accessDenied,
                                        connection->refusal());
            if (!makeRoom(credentials.uid))
                return refuseForNow(connection->takeSocket(), credentials,
                                    "too many connections: " + std::to_string(connections_.size()));
            connection->start();
            connections_.push_back(std::move(connection));
        } catch (const std::system_error& error) {
            refuseForNow(connection ? connection->takeSocket() : std::move(client), credentials,
                         std::string("too much at the same time: ") + error.what());
        }
    }

    void refuseForNow(Descriptor socket, const ucred& peer, std::string text) {
        turnedAway_.write(Level::Error, "A client is turned away, " + text);
        refusals_.refuse(std::move(socket), peer, wire::limitsExceeded, std::move(text));
    }

    // A user may have every seat that nobody else wants. When all are taken, the users who have more than the
    // newcomer's give one up, first of all the user with the most: the connection under which nothing has been under
    // way for the longest time, and one that is told of changes after all others. It may read what has just come before
    // it ends.
    bool makeRoom(uid_t newcomer) {
        std::map<uid_t, std::size_t> seats;
        std::size_t taken = 0;
        for (const auto& connection : connections_) {
            if (connection->isGivenUp()) continue;
            ++seats[connection->peer().user()];
            ++taken;
        }
        if (taken < limits_.connections) return true;
        if (connections_.size() >= 2 * limits_.connections) return false;  // those given up take their time
        ServiceConnection* chosen = nullptr;
        std::tuple<bool, std::size_t, std::chrono::steady_clock::rep> best;
        for (const auto& connection : connections_) {
            const auto idleSince = connection->idleSince();
            const std::size_t ofUser = seats[connection->peer().user()];
            if (connection->isGivenUp() || !idleSince || ofUser <= seats[newcomer]) continue;
            const std::tuple rank(!connection->isSubscribed(), ofUser, -*idleSince);
            if (chosen && rank <= best) continue;
            best = rank;
            chosen = connection.get();
        }
        if (!chosen) return false;
        chosen->giveUp();
        return true;
    }

    sd_event* const loop_;
    const int socket_;
    const BundleLookup& bundles_;
    ProcessLifecycle& lifecycle_;
    const ServiceLimits& limits_;
    platform::ServiceListenerDelegate* delegate_ = nullptr;
    Refusals refusals_;
    const Descriptor endedFile_;
    RequestLine line_;
    const SessionSurroundings surroundings_;
    RepeatedLine shortage_;
    RepeatedLine turnedAway_;
    std::list<std::unique_ptr<ServiceConnection>> connections_;
    EventSource endedSource_;
    EventSource acceptSource_;
    const EventSource restTimer_;
};

std::unique_ptr<platform::ServiceListener> ServiceListenerFactory::makeListener(std::string /*serviceName*/) {
    return std::make_unique<Listener>(loop_, socket_.number(), bundles_, lifecycle_, limits_, host_);
}

}  // namespace vrx::host
