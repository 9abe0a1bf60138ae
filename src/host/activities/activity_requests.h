// What testers ask of a running agent: to fire an activity now. A request is a row in host.db and a touch of a file in
// the home, which the agent watches; the answer comes in the row.
#pragma once

#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "vrx/host/home/database.h"
#include "vrx/platform/date.h"
#include "vrx/platform/error.h"

namespace vrx::host {

enum class FiringAnswer {
    Fired = 1,
    AlreadyRunning = 2,  // its earlier run has not handed back its result
    Unknown = 3,         // nobody has a handler for it
    NotStored = 4,       // the agent cannot write the database
};

inline constexpr const char* requestFileName = "fire";  // in the home

struct FiringRequest {
    std::int64_t number = 0;
    std::string identifier;
};

// The agent's side, within a transaction: the requests without an answer, and the answer to one.
std::vector<FiringRequest> openRequests(Connection& connection);
void answerRequest(Connection& connection, std::int64_t number, FiringAnswer answer);
// Drops those of an earlier process: who asked has been told by now that nobody answers.
void dropRequests(Connection& connection);

// The tool's side. Waits for the answer; nothing when no agent has the home, or when none has answered in time, and
// then the request is taken back. An error when the database cannot be written.
platform::Result<std::optional<FiringAnswer>> requestFiring(const std::string& home, Database& database,
                                                            std::string_view identifier, platform::Duration limit);

}  // namespace vrx::host
