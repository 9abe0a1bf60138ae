// What is to be said of a conversation with a server: pure functions of it and of the moment.
#pragma once

#include <string>
#include <vector>

#include "common/command_line.h"
#include "common/health.h"
#include "server_check/conversation.h"

namespace vrx::server_check {

using apps::Health;

// A note is worth a look; a problem is something that the agent cannot use.
struct Finding {
    std::string name;
    Health health;
    std::string text;
    std::string advice{};
    apps::ExitCode code = apps::ExitCode::NoAnswer;  // when it is the first problem
};

// In the order of the conversation.
std::vector<Finding> findingsOf(const CheckOptions& options, const Conversation& conversation);

// Each key of the record that the agent reads: as it was sent, and as it was read.
struct ReadKey {
    std::string path;
    std::string kind;  // "flag", "date", "days", "text", "list", "dictionary" or "number"
    platform::Value sent;
    platform::Value read;  // null for none
};
std::vector<ReadKey> readKeysOf(const platform::Value& record);

}  // namespace vrx::server_check
