#include "vrx/host/ipc/host_requests.h"

namespace vrx::host {

using platform::Array;
using platform::Dictionary;
using platform::Value;

Value valueOf(const AgentStatus& status) {
    return Dictionary{{"process", status.process},
                      {"user", status.user},
                      {"version", status.version},
                      {"home", status.home},
                      {"profile", Array(status.profile.begin(), status.profile.end())},
                      {"socket", status.socket}};
}

std::optional<AgentStatus> agentStatus(const Value& value) {
    const Array* layers = value["profile"].asArray();
    const auto process = value["process"].asInteger(), user = value["user"].asInteger();
    const std::string *version = value["version"].asString(), *home = value["home"].asString(),
                      *socket = value["socket"].asString();
    if (!layers || !process || !user || !version || !home || !socket) return std::nullopt;
    AgentStatus status{*process, *user, *version, *home, {}, *socket};
    for (const Value& layer : *layers)
        if (const std::string* path = layer.asString()) status.profile.push_back(*path);
    return status;
}

}  // namespace vrx::host
