// The background activities in host.db: what is scheduled, and how the last runs of each ended. Each operation is part
// of the caller's transaction.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "vrx/host/home/database.h"
#include "vrx/platform/activity_timing.h"

namespace vrx::host {

struct ScheduledActivity {
    std::int64_t generation = 0;  // identifies this registration: random, so unique over all files
    std::string identifier;
    platform::ActivityCriteria criteria;
    platform::DueTime due;
    int deferrals = 0;  // deferred or interrupted runs in a row
};

enum class RunOutcome {
    Finished = 1,
    Deferred = 2,
    Interrupted = 3,  // by the end of the process
};

struct ActivityRun {
    std::string identifier;
    std::int64_t generation = 0;
    platform::Date began;
    std::optional<platform::Date> ended{};  // absent while it runs, and when it was interrupted unnoticed
    std::optional<RunOutcome> outcome{};
};

class ActivityRegistry {
public:
    explicit ActivityRegistry(Connection& connection) : connection_(connection) {}

    // In the order of their due times.
    std::vector<ScheduledActivity> scheduled();
    std::optional<ScheduledActivity> scheduled(std::string_view identifier);
    // Replaces an earlier one of that identifier. Gets a generation of its own.
    void schedule(std::string_view identifier, const platform::ActivityCriteria& criteria,
                  const platform::DueTime& due);
    void postpone(std::int64_t generation, const platform::DueTime& due, int deferrals);
    void remove(std::int64_t generation);

    // The last run of each identifier.
    std::vector<ActivityRun> runs();
    // The last ones of each, in the order in which they began.
    std::vector<ActivityRun> history();
    static constexpr std::int64_t mostRuns = 50;  // that are kept of an identifier
    void beginRun(std::string_view identifier, std::int64_t generation, platform::Date now);
    void endRun(std::string_view identifier, RunOutcome outcome, platform::Date now);

private:
    static std::vector<ActivityRun> runsIn(Statement& query);

    Connection& connection_;
};

// For tools beside the agent.
struct ActivityList {
    std::vector<ScheduledActivity> scheduled;
    std::vector<ActivityRun> runs;
    std::vector<ActivityRun> history;
};
platform::Result<ActivityList> listActivities(Database& database);

}  // namespace vrx::host
