// vrxctl status: one page about the agent and the devices, for a person. It asks only what changes nothing.
#pragma once

#include "common/command_line.h"
#include "vrx/client/agent_connection.h"

namespace vrx::apps {

Outcome status(const client::ConnectionOptions& options);
// Again after each change, until a signal. The options have the socket's path.
Outcome watchStatus(CommandLine& line, const client::ConnectionOptions& options);

}  // namespace vrx::apps
