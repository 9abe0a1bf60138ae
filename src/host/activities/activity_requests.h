// Testers' requests to a running agent to fire an activity now. A request is a row in host.db and a touched file in the
// home, which the agent watches. The answer comes in the row.
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
// Drops requests to an earlier process. Whoever made them has timed out by now.
void dropRequests(Connection& connection);

// The tool's side. Waits for the answer. Nothing when no agent has the home, or when it does not answer in time; the
// request is withdrawn then. An error when the database cannot be written.
platform::Result<std::optional<FiringAnswer>> requestFiring(const std::string& home, Database& database,
                                                            std::string_view identifier, platform::Duration limit);

}  // namespace vrx::host
