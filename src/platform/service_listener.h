// The named IPC service. The listener asks its delegate about each new connection. An accepted connection has a thread
// of its own, on which it serves its client's requests in their order by calling the exported object.
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
    // Call both before resume(). The interface is named after the protocol; the connection keeps the object alive.
    virtual void setExportedInterface(std::string_view protocolName) = 0;
    virtual void setExportedObject(std::shared_ptr<VRXAgentProtocol> object) = 0;
    // Starts to serve requests.
    virtual void resume() = 0;
};

class ServiceListener;

class ServiceListenerDelegate {
public:
    virtual ~ServiceListenerDelegate() = default;
    // Returns true to accept the connection, after resuming it; false to refuse it. Called on any thread.
    virtual bool shouldAcceptNewConnection(ServiceListener& listener, ServiceConnection& connection) = 0;
};

class ServiceListener {
public:
    virtual ~ServiceListener() = default;
    // Call this before resume(). The listener does not own the delegate, which must outlive it.
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
