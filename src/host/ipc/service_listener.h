// The agent's service on a Unix socket: accepts clients on the main loop, asks the delegate about each, and serves each
// accepted one on a thread of its own.
//
//     BundleLookup bundles([&] { return host.profile().content(); });
//     ServiceListenerFactory factory(host.mainLoop().event(), bundles, host.lifecycle());
//     if (MaybeError error = factory.open(socketPath)) …         // tell, and exit
//     host.setServiceListenerFactory(&factory);
//
// Main thread.
#pragma once

#include <systemd/sd-event.h>

#include <memory>
#include <string>

#include "vrx/host/ipc/bundle_lookup.h"
#include "vrx/host/ipc/host_requests.h"
#include "vrx/host/ipc/listening_socket.h"
#include "vrx/host/ipc/service_limits.h"
#include "vrx/host/loop/process_lifecycle.h"
#include "vrx/platform/error.h"
#include "vrx/platform/service_listener.h"

namespace vrx::host {

class ServiceListenerFactory final : public platform::ServiceListenerFactory {
public:
    // The event loop, the lookup and the lifecycle must outlive the factory, and the factory its listeners. So must
    // what the host answers, where it answers.
    ServiceListenerFactory(sd_event* loop, const BundleLookup& bundles, ProcessLifecycle& lifecycle,
                           const ServiceLimits& limits = {}, HostRequests* host = nullptr)
        : loop_(loop), bundles_(bundles), lifecycle_(lifecycle), limits_(limits), host_(host) {}

    // Takes the socket that the service manager passed, else binds one at the path. Clients can connect from now on and
    // wait until the listener is resumed. An error's text is for people.
    platform::MaybeError open(const std::string& socketPath) { return socket_.open(socketPath); }

    // One at a time, for the open socket, whatever the service's name.
    std::unique_ptr<platform::ServiceListener> makeListener(std::string serviceName) override;

    // Gives up the open socket, for the program that this process executes next. Clients that connect meanwhile wait in
    // it.
    PassedSocket release() { return socket_.release(); }

private:
    class Listener;

    sd_event* const loop_;
    const BundleLookup& bundles_;
    ProcessLifecycle& lifecycle_;
    const ServiceLimits limits_;
    HostRequests* const host_;
    ListeningSocket socket_;
};

}  // namespace vrx::host
