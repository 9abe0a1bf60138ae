// The named IPC service. The listener asks its delegate about each new connection; an accepted connection serves the
// requests of its client, in the order in which they come, on a thread of its own by calling the exported object.
#pragma once

#include <cstdint>
#include <memory>
#include <string>
#include <string_view>

#include "vrx/platform/value.h"

namespace vrx {
class VRXAgentProtocol;
}

namespace vrx::platform {

class ServiceConnection {
public:
    virtual ~ServiceConnection() = default;
    virtual std::int32_t processIdentifier() const = 0;
    // Null when the caller does not hold the entitlement.
    virtual Value valueForEntitlement(std::string_view name) const = 0;
    // The interface is named after the protocol; the connection keeps the object alive. Both before resume().
    virtual void setExportedInterface(std::string_view protocolName) = 0;
    virtual void setExportedObject(std::shared_ptr<VRXAgentProtocol> object) = 0;
    // Starts to serve requests.
    virtual void resume() = 0;
};

class ServiceListener;

class ServiceListenerDelegate {
public:
    virtual ~ServiceListenerDelegate() = default;
    // True accepts the connection, which the delegate has resumed by then; false refuses it. Called on any thread.
    virtual bool shouldAcceptNewConnection(ServiceListener& listener, ServiceConnection& connection) = 0;
};

class ServiceListener {
public:
    virtual ~ServiceListener() = default;
    // Before resume(); the listener does not own it, and it must outlive the listener.
    virtual void setDelegate(ServiceListenerDelegate* delegate) = 0;
    // Starts to accept connections.
    virtual void resume() = 0;
};

class ServiceListenerFactory {
public:
    virtual ~ServiceListenerFactory() = default;
    virtual std::unique_ptr<ServiceListener> makeListener(std::string serviceName) = 0;
};

}  // namespace vrx::platform
