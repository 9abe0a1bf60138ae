#include "vrx/host/ipc/service_connection.h"

#include <poll.h>
#include <pthread.h>
#include <sys/ioctl.h>
#include <sys/socket.h>

#include <system_error>

#include "vrx/platform/log.h"

namespace vrx::host {

using platform::Value;

ServiceConnection::ServiceConnection(Descriptor&& socket, PeerIdentity&& peer, const BundleLookup& bundles,
                                     const SessionSurroundings& surroundings, std::function<void()> onEnd)
    : socket_(std::move(socket)),
      peer_(std::move(peer)),
      bundles_(bundles),
      surroundings_(surroundings),
      onEnd_(std::move(onEnd)) {}

ServiceConnection::~ServiceConnection() {
    stop();
    if (thread_.joinable()) thread_.join();
}

void ServiceConnection::stop() {
    state_.isStopping = true;
    box_->wake();
}

void ServiceConnection::giveUp() {
    state_.isGivenUp = true;
    box_->wake();
}

std::optional<std::chrono::steady_clock::rep> ServiceConnection::idleSince() const {
    const auto since = state_.idleSince.load();
    return since == 0 || hasUnread() ? std::nullopt : std::optional(since);
}

Value ServiceConnection::valueForEntitlement(std::string_view name) const {
    platform::Result<Value> found = bundles_.entitlement(peer_, name);
    if (!found) throw std::system_error(found.error().code, std::generic_category());
    Value value = std::move(found).value();
    if (!value.asBool().value_or(false)) missingEntitlement_ = name;
    return value;
}

void ServiceConnection::setExportedInterface(std::string_view protocolName) {
    // This host has one protocol.
    if (protocolName != VRXAgentProtocol::protocolName)
        throw std::invalid_argument("cannot export " + std::string(protocolName));
}

void ServiceConnection::start() {
    servedSocket_ = socket_.number();
    thread_ = std::thread([this] { serve(); });
}

void ServiceConnection::serve() {
    pthread_setname_np(pthread_self(), "connection");
    {
        ClientSession session(std::move(socket_), peer_, std::move(object_), box_, surroundings_);
        session.serve(state_);
        servedSocket_ = -1;  // before the session closes it
    }
    hasEnded_ = true;
    onEnd_();
}

bool ServiceConnection::readsLast() {
    if (servedSocket_ < 0) return false;
    shutdown(servedSocket_, SHUT_RD);
    int bytes = 0;
    return ioctl(servedSocket_, FIONREAD, &bytes) == 0 && bytes > 0;
}

bool ServiceConnection::hasUnread() const {
    pollfd file{servedSocket_, POLLIN, 0};
    return file.fd >= 0 && poll(&file, 1, 0) > 0;
}

std::string ServiceConnection::refusal() const {
    const std::string caller = bundles_.describe(peer_);
    return missingEntitlement_.empty() ? caller + " is not served"
                                       : caller + " does not hold the entitlement " + missingEntitlement_;
}

}  // namespace vrx::host
