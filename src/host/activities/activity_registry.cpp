#include "vrx/host/activities/activity_registry.h"

namespace vrx::host {

using platform::ActivityCriteria;
using platform::Date;
using platform::DueTime;
using platform::Duration;
using platform::MaybeError;

namespace {

constexpr const char* allScheduled =
    "SELECT generation, identifier, delay, grace_period, requires_network, due_boot, due_since_boot, due_wall, wait, "
    "is_carried_over, deferrals FROM activities ORDER BY due_since_boot, identifier";
constexpr const char* oneScheduled =
    "SELECT generation, identifier, delay, grace_period, requires_network, due_boot, due_since_boot, due_wall, wait, "
    "is_carried_over, deferrals FROM activities WHERE identifier = ?";

ScheduledActivity scheduledIn(const Statement& row) {
    return {.generation = row.integer(0),
            .identifier = std::string(row.text(1)),
            .criteria = {row.integer(2), row.integer(3), row.integer(4) != 0},
            .due = {std::string(row.text(5)), Duration(row.number(6)), platform::dateFromEpoch(row.number(7)),
                    Duration(row.number(8)), row.integer(9) != 0},
            .deferrals = static_cast<int>(row.integer(10))};
}

// Binds its five columns, from a parameter on.
Statement& bindDue(Statement& statement, int parameter, const DueTime& due) {
    return statement.bind(parameter, due.boot)
        .bind(parameter + 1, due.sinceBoot.count())
        .bind(parameter + 2, platform::epochSeconds(due.wall))
        .bind(parameter + 3, due.wait.count())
        .bind(parameter + 4, std::int64_t{due.isCarriedOver});
}

}  // namespace

std::vector<ScheduledActivity> ActivityRegistry::scheduled() {
    std::vector<ScheduledActivity> activities;
    Statement& query = connection_.statement(allScheduled);
    while (query.step()) activities.push_back(scheduledIn(query));
    return activities;
}

std::optional<ScheduledActivity> ActivityRegistry::scheduled(std::string_view identifier) {
    Statement& query = connection_.statement(oneScheduled).bind(0, identifier);
    if (!query.step()) return std::nullopt;
    return scheduledIn(query);
}

void ActivityRegistry::schedule(std::string_view identifier, const ActivityCriteria& criteria, const DueTime& due) {
    Statement& insertion = connection_.statement(
        "REPLACE INTO activities (generation, identifier, delay, grace_period, requires_network, due_boot, "
        "due_since_boot, due_wall, wait, is_carried_over, deferrals) "
        "VALUES (random() & 0x7fffffffffffffff, ?, ?, ?, ?, ?, ?, ?, ?, ?, 0)");
    insertion.bind(0, identifier)
        .bind(1, criteria.delay)
        .bind(2, criteria.gracePeriod)
        .bind(3, std::int64_t{criteria.requiresNetwork});
    bindDue(insertion, 4, due).step();
}

void ActivityRegistry::postpone(std::int64_t generation, const DueTime& due, int deferrals) {
    Statement& update = connection_.statement(
        "UPDATE activities SET due_boot = ?, due_since_boot = ?, due_wall = ?, wait = ?, is_carried_over = ?, "
        "deferrals = ? WHERE generation = ?");
    bindDue(update, 0, due).bind(5, std::int64_t{deferrals}).bind(6, generation).step();
}

void ActivityRegistry::remove(std::int64_t generation) {
    connection_.statement("DELETE FROM activities WHERE generation = ?").bind(0, generation).step();
}

std::vector<ActivityRun> ActivityRegistry::runs() {
    return runsIn(connection_.statement(
        "SELECT identifier, generation, began, ended, outcome FROM activity_runs "
        "WHERE number IN (SELECT max(number) FROM activity_runs GROUP BY identifier) ORDER BY began, identifier"));
}

std::vector<ActivityRun> ActivityRegistry::history() {
    return runsIn(connection_.statement(
        "SELECT identifier, generation, began, ended, outcome FROM activity_runs ORDER BY number"));
}

std::vector<ActivityRun> ActivityRegistry::runsIn(Statement& query) {
    std::vector<ActivityRun> runs;
    while (query.step()) {
        ActivityRun run{std::string(query.text(0)), query.integer(1), platform::dateFromEpoch(query.number(2))};
        if (query.type(3) != SQLITE_NULL) {
            run.ended = platform::dateFromEpoch(query.number(3));
            run.outcome = static_cast<RunOutcome>(query.integer(4));
        }
        runs.push_back(std::move(run));
    }
    return runs;
}

void ActivityRegistry::beginRun(std::string_view identifier, std::int64_t generation, Date now) {
    connection_.statement("INSERT INTO activity_runs (identifier, generation, began) VALUES (?, ?, ?)")
        .bind(0, identifier)
        .bind(1, generation)
        .bind(2, platform::epochSeconds(now))
        .step();
    connection_
        .statement(
            "DELETE FROM activity_runs WHERE identifier = ? AND number NOT IN "
            "(SELECT number FROM activity_runs WHERE identifier = ? ORDER BY number DESC LIMIT ?)")
        .bind(0, identifier)
        .bind(1, identifier)
        .bind(2, mostRuns)
        .step();
}

void ActivityRegistry::endRun(std::string_view identifier, RunOutcome outcome, Date now) {
    connection_
        .statement(
            "UPDATE activity_runs SET ended = ?, outcome = ? "
            "WHERE number = (SELECT max(number) FROM activity_runs WHERE identifier = ?)")
        .bind(0, platform::epochSeconds(now))
        .bind(1, static_cast<std::int64_t>(outcome))
        .bind(2, identifier)
        .step();
}

platform::Result<ActivityList> listActivities(Database& database) {
    ActivityList list;
    MaybeError error = database.read([&](Connection& connection) {
        ActivityRegistry registry(connection);
        list = {registry.scheduled(), registry.runs(), registry.history()};
    });
    if (error) return *error;
    return list;
}

}  // namespace vrx::host
