// Whether the agent's servers can be reached, asked as the agent asks them. Stores nothing.
#pragma once

#include <optional>
#include <string>
#include <vector>

#include "vrx/platform/date.h"
#include "vrx/platform/http_request.h"
#include "vrxhost/agent_view.h"

namespace vrx::apps {

struct Reachability {
    // Absent when not answered in time.
    std::optional<bool> isServerVersionSupported{};
    std::vector<std::string> serverVersionErrors{};
    platform::Value serverVersions{};  // the document that was read
    std::string coverageUrl;
    std::optional<platform::HttpResponse> coverage{};
};

// SIGINT and SIGTERM end the asking.
Reachability askServers(AgentView& view, platform::Duration limit);

}  // namespace vrx::apps
