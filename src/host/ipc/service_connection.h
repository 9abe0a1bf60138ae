// One client's connection, from its acceptance on. Tells the listener's delegate who the client is, and once resumed
// serves it on a thread of its own. Main thread.
#pragma once

#include <atomic>
#include <functional>
#include <memory>
#include <string>
#include <thread>

#include "vrx/host/base/descriptor.h"
#include "vrx/host/ipc/bundle_lookup.h"
#include "vrx/host/ipc/peer_identity.h"
#include "vrx/host/ipc/reply_box.h"
#include "vrx/host/ipc/service_limits.h"
#include "vrx/host/loop/process_lifecycle.h"
#include "vrx/platform/service_listener.h"

namespace vrx::host {

class ServiceConnection final : public platform::ServiceConnection {
public:
    // Calls onEnd on the connection's thread when it has ended.
    ServiceConnection(Descriptor socket, PeerIdentity peer, const BundleLookup& bundles, const ServiceLimits& limits,
                      ProcessLifecycle& lifecycle, std::function<void()> onEnd);
    // Ends the connection. Waits for a running operation to return; its reply is dropped.
    ~ServiceConnection() override;

    std::int32_t processIdentifier() const override { return peer_.processIdentifier(); }
    platform::Value valueForEntitlement(std::string_view name) const override;
    void setExportedInterface(std::string_view protocolName) override;
    void setExportedObject(std::shared_ptr<VRXAgentProtocol> object) override { object_ = std::move(object); }
    void resume() override;

    const PeerIdentity& peer() const { return peer_; }
    bool isResumed() const { return thread_.joinable(); }
    bool hasEnded() const { return hasEnded_; }
    // Whether the client has sent something that its thread has not read. Valid only while no work is in flight and
    // none can begin.
    bool hasUnread() const;
    // Begins to end it without waiting.
    void stop();

    // For a refusal: the text for the client, and its socket, which this object then gives up.
    std::string refusal() const;
    Descriptor takeSocket() { return std::move(socket_); }

private:
    void serve();

    Descriptor socket_;
    const PeerIdentity peer_;
    const BundleLookup& bundles_;
    const ServiceLimits& limits_;
    ProcessLifecycle& lifecycle_;
    const std::function<void()> onEnd_;
    mutable std::string missingEntitlement_;
    std::shared_ptr<VRXAgentProtocol> object_;
    const std::shared_ptr<ReplyBox> box_ = std::make_shared<ReplyBox>();
    std::atomic<bool> isStopping_ = false;
    std::atomic<bool> hasEnded_ = false;
    std::atomic<int> servedSocket_ = -1;
    std::thread thread_;
};

}  // namespace vrx::host
