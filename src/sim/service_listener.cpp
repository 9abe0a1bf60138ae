#include "vrx/sim/service_listener.h"

#include <utility>

namespace vrx::sim {

platform::Value ServiceConnection::valueForEntitlement(std::string_view name) const {
    auto entry = entitlements_.find(name);
    return entry == entitlements_.end() ? platform::Value() : entry->second;
}

void ServiceConnection::request(platform::UniqueFunction<void(VRXAgentProtocol&)> call) {
    if (interference_.strikes(Defect::ReplyDropped)) return;
    queue_->post([object = object_, call = std::move(call)] { call(*object); });
}

class ServiceListenerFactory::Listener final : public platform::ServiceListener {
public:
    Listener(ServiceListenerFactory& factory, std::string serviceName)
        : serviceName(std::move(serviceName)), factory_(factory) {}
    ~Listener() override {
        if (factory_.listener_ == this) factory_.listener_ = nullptr;
    }

    void setDelegate(platform::ServiceListenerDelegate* newDelegate) override { delegate = newDelegate; }
    void resume() override {
        if (!delegate) return factory_.failures_.report("a service listener without a delegate was resumed");
        factory_.listener_ = this;
    }

    const std::string serviceName;
    platform::ServiceListenerDelegate* delegate = nullptr;

private:
    ServiceListenerFactory& factory_;
};

std::unique_ptr<platform::ServiceListener> ServiceListenerFactory::makeListener(std::string serviceName) {
    return std::make_unique<Listener>(*this, std::move(serviceName));
}

std::shared_ptr<ServiceConnection> ServiceListenerFactory::connect(std::int32_t processIdentifier,
                                                                   platform::Dictionary entitlements) {
    if (!listener_) return nullptr;
    auto connection = std::make_shared<ServiceConnection>(
        processIdentifier, std::move(entitlements),
        queues_.makeSerialQueue("connection of " + std::to_string(processIdentifier)), interference_);
    bool isAccepted = listener_->delegate->shouldAcceptNewConnection(*listener_, *connection);
    if (isAccepted && !connection->isServing())
        failures_.report("a connection was accepted that exports nothing or was not resumed");
    return isAccepted && connection->isServing() ? connection : nullptr;
}

std::string ServiceListenerFactory::serviceName() const {
    return listener_ ? listener_->serviceName : std::string();
}

}  // namespace vrx::sim
