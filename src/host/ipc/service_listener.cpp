#include "vrx/host/ipc/service_listener.h"

#include <fcntl.h>
#include <malloc.h>
#include <sys/socket.h>

#include <algorithm>
#include <cerrno>
#include <list>
#include <system_error>

#include "vrx/host/ipc/refusals.h"
#include "vrx/host/ipc/service_connection.h"
#include "vrx/host/loop/event_source.h"
#include "vrx/platform/log.h"
#include "vrx/wire/names.h"

namespace vrx::host {

using platform::Level;
using platform::log;
using platform::Result;

namespace {

Descriptor openSpare() {
    return Descriptor(open("/dev/null", O_RDONLY | O_CLOEXEC));
}

}  // namespace

class ServiceListenerFactory::Listener final : public platform::ServiceListener {
public:
    Listener(sd_event* loop, int socket, const BundleLookup& bundles, ProcessLifecycle& lifecycle,
             const ServiceLimits& limits)
        : loop_(loop),
          socket_(socket),
          bundles_(bundles),
          lifecycle_(lifecycle),
          limits_(limits),
          refusals_(limits),
          endedFile_(makeEventFile()),
          spare_(openSpare()) {
        endedSource_ = addReadSource(loop_, endedFile_.number(), onEnded, this);
        lifecycle_.setUnreadQuestion([this] { return hasUnread(); });
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

    bool hasUnread() const {
        return std::any_of(connections_.begin(), connections_.end(),
                           [](const auto& connection) { return connection->hasUnread(); });
    }

    void acceptAll() {
        while (true) {
            Descriptor client(accept4(socket_, nullptr, nullptr, SOCK_CLOEXEC | SOCK_NONBLOCK));
            if (client)
                take(std::move(client));
            else if (errno == EMFILE || errno == ENFILE)
                turnAway();
            else if (errno != ECONNABORTED && errno != EINTR)
                return;
        }
    }

    // Without a free descriptor, accepts the client with the spare one and closes it. Left in the queue, it would wake
    // the loop without end.
    void turnAway() {
        log(Level::Error, "A client was turned away: too many open files");
        spare_ = Descriptor();
        Descriptor client(accept4(socket_, nullptr, nullptr, SOCK_CLOEXEC | SOCK_NONBLOCK));
        client = Descriptor();
        spare_ = openSpare();
    }

    // A refused client gets no thread of its own, and no object is made for it.
    void take(Descriptor client) {
        Result<PeerIdentity> peer = PeerIdentity::ofPeer(client.number());
        if (!peer) return;  // it has already ended
        removeEnded();
        if (connections_.size() >= limits_.connections)
            return refusals_.refuse(std::move(client), peer->processIdentifier(), wire::limitsExceeded,
                                    "too many connections: " + std::to_string(connections_.size()));
        auto connection =
            std::make_unique<ServiceConnection>(std::move(client), std::move(peer).value(), bundles_, limits_,
                                                lifecycle_, [this] { eventfd_write(endedFile_.number(), 1); });
        try {
            const BundleLookup::Acceptance acceptance(connection->peer());
            if (delegate_->shouldAcceptNewConnection(*this, *connection) && connection->isResumed())
                connections_.push_back(std::move(connection));
            else
                refuse(*connection, wire::accessDenied, connection->refusal());
        } catch (const std::system_error& error) {
            refuse(*connection, wire::limitsExceeded, std::string("cannot serve: ") + error.what());
        }
    }

    void refuse(ServiceConnection& connection, const char* errorName, std::string text) {
        if (connection.isResumed()) return;  // it ends with its object
        if (Descriptor socket = connection.takeSocket())
            refusals_.refuse(std::move(socket), connection.processIdentifier(), errorName, std::move(text));
    }

    sd_event* const loop_;
    const int socket_;
    const BundleLookup& bundles_;
    ProcessLifecycle& lifecycle_;
    const ServiceLimits& limits_;
    platform::ServiceListenerDelegate* delegate_ = nullptr;
    Refusals refusals_;
    const Descriptor endedFile_;
    Descriptor spare_;
    std::list<std::unique_ptr<ServiceConnection>> connections_;
    EventSource endedSource_;
    EventSource acceptSource_;
};

std::unique_ptr<platform::ServiceListener> ServiceListenerFactory::makeListener(std::string /*serviceName*/) {
    return std::make_unique<Listener>(loop_, socket_.number(), bundles_, lifecycle_, limits_);
}

}  // namespace vrx::host
