#include "vrx/host/ipc/service_connection.h"

#include <poll.h>
#include <pthread.h>

#include "vrx/host/ipc/client_session.h"
#include "vrx/platform/log.h"

namespace vrx::host {

using platform::Value;

ServiceConnection::ServiceConnection(Descriptor socket, PeerIdentity peer, const BundleLookup& bundles,
                                     const ServiceLimits& limits, ProcessLifecycle& lifecycle,
                                     std::function<void()> onEnd)
    : socket_(std::move(socket)),
      peer_(std::move(peer)),
      bundles_(bundles),
      limits_(limits),
      lifecycle_(lifecycle),
      onEnd_(std::move(onEnd)) {}

ServiceConnection::~ServiceConnection() {
    stop();
    if (thread_.joinable()) thread_.join();
}

void ServiceConnection::stop() {
    isStopping_ = true;
    box_->wake();
}

Value ServiceConnection::valueForEntitlement(std::string_view name) const {
    Value value = bundles_.entitlement(peer_, name);
    if (!value.asBool().value_or(false)) missingEntitlement_ = name;
    return value;
}

void ServiceConnection::setExportedInterface(std::string_view protocolName) {
    // This host has one protocol.
    if (protocolName != VRXAgentProtocol::protocolName)
        throw std::invalid_argument("cannot export " + std::string(protocolName));
}

void ServiceConnection::resume() {
    servedSocket_ = socket_.number();
    thread_ = std::thread([this] { serve(); });
}

void ServiceConnection::serve() {
    pthread_setname_np(pthread_self(), "connection");
    {
        ClientSession session(std::move(socket_), peer_, std::move(object_), box_, limits_, lifecycle_);
        session.serve(isStopping_);
        servedSocket_ = -1;  // before the session closes it
    }
    hasEnded_ = true;
    onEnd_();
}

bool ServiceConnection::hasUnread() const {
    pollfd file{servedSocket_, POLLIN, 0};
    return file.fd >= 0 && poll(&file, 1, 0) > 0;
}

std::string ServiceConnection::refusal() const {
    const std::string caller = peer_.executable().empty() ? "process " + std::to_string(peer_.processIdentifier()) +
                                                                ", whose program cannot be told,"
                                                          : peer_.executable();
    return missingEntitlement_.empty() ? caller + " is not served"
                                       : caller + " does not hold the entitlement " + missingEntitlement_;
}

}  // namespace vrx::host
