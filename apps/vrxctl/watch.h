// vrxctl watch: a line for each change that the agent tells of, until a signal.
#pragma once

#include "common/command_line.h"
#include "vrx/client/answer.h"

namespace vrx::apps {

// What a failed call means to the user of vrxctl.
Outcome outcomeOfFailure(const client::Failure& failure, const std::string& socket, platform::Duration limit);

// Blocks SIGINT and SIGTERM for the rest of the program.
Outcome watchChanges(CommandLine& line, const client::ConnectionOptions& options);

}  // namespace vrx::apps
