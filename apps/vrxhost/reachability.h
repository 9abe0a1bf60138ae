// Whether the servers that an agent fetches from can be had, asked as the agent would ask them. Keeps nothing.
#pragma once

#include <optional>
#include <string>
#include <vector>

#include "vrx/platform/date.h"
#include "vrx/platform/http_request.h"
#include "vrxhost/agent_view.h"

namespace vrx::apps {

struct Reachability {
    // Nothing of what was not answered in time.
    std::optional<bool> isServerVersionSupported{};
    std::vector<std::string> serverVersionErrors{};
    platform::Value serverVersions{};  // the document that counts
    std::string coverageUrl;
    std::optional<platform::HttpResponse> coverage{};
};

// Takes SIGINT and SIGTERM over, which end the asking.
Reachability askServers(AgentView& view, platform::Duration limit);

}  // namespace vrx::apps
