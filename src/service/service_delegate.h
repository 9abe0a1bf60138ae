// Decides about each new client connection. Only callers that hold the agent's entitlement are served, each by an agent
// of its own that knows the caller's bundle identifier. Called on the listener's thread.
// A leading "_" is spelled so on purpose; "Names" in docs/architecture.md says why.
#pragma once

#include <cstdint>
#include <optional>

#include "vrx/platform/bundle_lookup.h"
#include "vrx/platform/service_listener.h"
#include "vrx/protocols/agent_collaborators.h"

namespace vrx {

class ServiceDelegate final : public platform::ServiceListenerDelegate {
public:
    // Every agent gets the collaborators.
    explicit ServiceDelegate(AgentCollaborators collaborators) : collaborators_(std::move(collaborators)) {}

    bool shouldAcceptNewConnection(platform::ServiceListener& listener,
                                   platform::ServiceConnection& connection) override;

    // The bundle that holds the process's executable; null when there is none.
    std::optional<platform::Bundle> _bundleForPID(std::int32_t processIdentifier) const;

private:
    const AgentCollaborators collaborators_;
};

}  // namespace vrx
