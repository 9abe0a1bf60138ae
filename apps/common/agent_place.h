// What the programs advise about an agent, by the place of its socket. Any thread.
#pragma once

#include <string>

#include "vrx/wire/locations.h"

namespace vrx::apps {

// The command that starts, stops or restarts the packaged unit of the agent whose socket it is.
inline std::string unitCommand(const std::string& verb, const std::string& socket) {
    return std::string("systemctl ") + (wire::isOfSystem(socket) ? "" : "--user ") + verb + " vrxagent";
}

}  // namespace vrx::apps
