#include "host/service/service_connection.h"

#include <pthread.h>

#include "host/service/client_session.h"
#include "platform/log.h"

namespace vrx::host {

using platform::Value;

ServiceConnection::ServiceConnection(Descriptor socket, PeerIdentity peer, const BundleLookup& bundles,
                                     const ServiceLimits& limits, std::function<void()> onEnd)
    : socket_(std::move(socket)),
      peer_(std::move(peer)),
      bundles_(bundles),
      limits_(limits),
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
    // The one that this host speaks.
    if (protocolName != VRXAgentProtocol::protocolName)
        throw std::invalid_argument("cannot export " + std::string(protocolName));
}

void ServiceConnection::resume() {
    thread_ = std::thread([this] { serve(); });
}

void ServiceConnection::serve() {
    pthread_setname_np(pthread_self(), "connection");
    ClientSession(std::move(socket_), peer_, std::move(object_), box_, limits_).serve(isStopping_);
    hasEnded_ = true;
    onEnd_();
}

std::string ServiceConnection::refusal() const {
    const std::string caller = peer_.executable().empty() ? "process " + std::to_string(peer_.processIdentifier()) +
                                                                ", whose program cannot be told,"
                                                          : peer_.executable();
    return missingEntitlement_.empty() ? caller + " is not served"
                                       : caller + " does not hold the entitlement " + missingEntitlement_;
}

}  // namespace vrx::host
