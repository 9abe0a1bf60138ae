// One client's connection, from its acceptance on. Tells the listener's delegate who the client is, and once resumed
// serves it on a thread of its own. Main thread.
#pragma once

#include <atomic>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <thread>

#include "vrx/host/base/descriptor.h"
#include "vrx/host/ipc/bundle_lookup.h"
#include "vrx/host/ipc/client_session.h"
#include "vrx/host/ipc/peer_identity.h"
#include "vrx/host/ipc/reply_box.h"
#include "vrx/platform/service_listener.h"

namespace vrx::host {

class ServiceConnection final : public platform::ServiceConnection {
public:
    // Calls onEnd on the connection's thread when it has ended. Takes the socket only if it does not throw.
    ServiceConnection(Descriptor&& socket, PeerIdentity&& peer, const BundleLookup& bundles,
                      const SessionSurroundings& surroundings, std::function<void()> onEnd);
    // Ends the connection. Waits for a running operation to return; its reply is dropped.
    ~ServiceConnection() override;

    std::int32_t processIdentifier() const override { return peer_.processIdentifier(); }
    // Throws a std::system_error when there was no descriptor or memory left to look it up.
    platform::Value valueForEntitlement(std::string_view name) const override;
    void setExportedInterface(std::string_view protocolName) override;
    void setExportedObject(std::shared_ptr<VRXAgentProtocol> object) override { object_ = std::move(object); }
    // Lets the listener start it.
    void resume() override { isResumed_ = true; }

    const PeerIdentity& peer() const { return peer_; }
    bool isResumed() const { return isResumed_; }
    // Throws a std::system_error when no thread can be made.
    void start();
    bool hasEnded() const { return hasEnded_; }

    // Since when nothing is under way, by the steady clock; nothing while something is.
    std::optional<std::chrono::steady_clock::rep> idleSince() const;
    // Lets it end as soon as nothing is under way.
    void giveUp();
    bool isSubscribed() const { return state_.isSubscribed; }
    bool isGivenUp() const { return state_.isGivenUp; }
    // From now on the client can send nothing more, and knows it from its write. Whether it has sent something that its
    // thread has not read; that is still answered. Only while no work is in flight and none can begin.
    bool readsLast();
    // Begins to end it without waiting.
    void stop();

    // For a refusal: the text for the client, and its socket, which this object then gives up.
    std::string refusal() const;
    Descriptor takeSocket() { return std::move(socket_); }

private:
    void serve();
    bool hasUnread() const;

    const std::shared_ptr<ReplyBox> box_ = std::make_shared<ReplyBox>();  // may throw, so it comes first
    Descriptor socket_;
    const PeerIdentity peer_;
    const BundleLookup& bundles_;
    const SessionSurroundings& surroundings_;
    const std::function<void()> onEnd_;
    mutable std::string missingEntitlement_;
    std::shared_ptr<VRXAgentProtocol> object_;
    bool isResumed_ = false;
    SessionState state_;
    std::atomic<bool> hasEnded_ = false;
    std::atomic<int> servedSocket_ = -1;
    std::thread thread_;
};

}  // namespace vrx::host
