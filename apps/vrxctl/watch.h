// Verbs of vrxctl that show something after each change that the agent tells of, until a signal.
#pragma once

#include <functional>

#include "common/command_line.h"
#include "vrx/client/answer.h"
#include "vrx/client/changes.h"

namespace vrx::apps {

// What a failed call means to the user of vrxctl.
Outcome outcomeOfFailure(const client::Failure& failure, const std::string& socket, platform::Duration limit);

// Shows what the function makes of each change. The options have the socket's path. Blocks SIGINT and SIGTERM for the
// rest of the program.
Outcome showChanges(CommandLine& line, const client::ConnectionOptions& options,
                    std::function<Outcome(const client::Change&)> outcomeOf);

// A line for each change: what may be other.
Outcome watchChanges(CommandLine& line, const client::ConnectionOptions& options);

}  // namespace vrx::apps
