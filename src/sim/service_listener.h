// The IPC service without a wire. Tests connect to it as a process of their choice and call the object that the agent
// exported.
#pragma once

#include <functional>
#include <map>
#include <memory>
#include <string>
#include <vector>

#include "vrx/platform/queue.h"
#include "vrx/platform/service_listener.h"
#include "vrx/protocols/agent_protocol.h"
#include "vrx/sim/failures.h"
#include "vrx/sim/interference.h"

namespace vrx::sim {

// Requests run in order, on the connection's own queue.
class ServiceConnection final : public platform::ServiceConnection {
public:
    ServiceConnection(std::int32_t processIdentifier, platform::Dictionary entitlements,
                      std::shared_ptr<platform::Queue> queue, const Interference& interference)
        : processIdentifier_(processIdentifier),
          entitlements_(std::move(entitlements)),
          queue_(std::move(queue)),
          interference_(interference) {}

    std::int32_t processIdentifier() const override { return processIdentifier_; }
    platform::Value valueForEntitlement(std::string_view name) const override;
    void setExportedInterface(std::string_view protocolName) override { interface_ = protocolName; }
    void setExportedObject(std::shared_ptr<VRXAgentProtocol> object) override { object_ = std::move(object); }
    void resume() override { isResumed_ = true; }

    // Whether it serves requests.
    bool isServing() const { return isResumed_ && object_ && interface_ == VRXAgentProtocol::protocolName; }
    const std::shared_ptr<VRXAgentProtocol>& object() const { return object_; }
    const std::string& interface() const { return interface_; }

    // Makes a request at the connection's next turn.
    void request(platform::UniqueFunction<void(VRXAgentProtocol&)> call);

private:
    const std::int32_t processIdentifier_;
    const platform::Dictionary entitlements_;
    const std::shared_ptr<platform::Queue> queue_;
    const Interference& interference_;
    std::string interface_;
    std::shared_ptr<VRXAgentProtocol> object_;
    bool isResumed_ = false;
};

class ServiceListenerFactory final : public platform::ServiceListenerFactory {
public:
    ServiceListenerFactory(platform::Queues& queues, const Failures& failures, const Interference& interference)
        : queues_(queues), failures_(failures), interference_(interference) {}

    std::unique_ptr<platform::ServiceListener> makeListener(std::string serviceName) override;

    // Connects to the service as the process. Null when the connection was refused, or when no listener has resumed.
    // The connection is served for as long as the caller keeps it.
    std::shared_ptr<ServiceConnection> connect(std::int32_t processIdentifier, platform::Dictionary entitlements);
    // The name of the service that takes connections; empty when there is none.
    std::string serviceName() const;

private:
    class Listener;

    platform::Queues& queues_;
    const Failures& failures_;
    const Interference& interference_;
    Listener* listener_ = nullptr;  // the one that takes connections
};

}  // namespace vrx::sim
