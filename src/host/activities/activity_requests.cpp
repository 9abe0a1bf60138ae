#include "vrx/host/activities/activity_requests.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <chrono>
#include <thread>

#include "vrx/host/base/descriptor.h"
#include "vrx/host/home/home_lock.h"

namespace vrx::host {

using platform::MaybeError;

namespace {

// The agent sees that the file is closed after writing. Made by root, it belongs to the home's owner all the same.
void touch(const std::string& home) {
    const std::string path = home + "/" + requestFileName;
    const Descriptor file(::open(path.c_str(), O_WRONLY | O_CREAT | O_CLOEXEC | O_NOFOLLOW, 0600));
    struct stat owner;
    if (file && geteuid() == 0 && stat(home.c_str(), &owner) == 0) [[maybe_unused]]
        const int result = fchown(file.number(), owner.st_uid, owner.st_gid);
}

void removeRequest(Database& database, std::int64_t number) {
    database.write([&](Connection& connection) {
        connection.statement("DELETE FROM activity_requests WHERE number = ?").bind(0, number).step();
    });
}

std::optional<FiringAnswer> answerTo(Database& database, std::int64_t number) {
    std::optional<FiringAnswer> answer;
    database.read([&](Connection& connection) {
        Statement& query = connection.statement("SELECT answer FROM activity_requests WHERE number = ?");
        if (query.bind(0, number).step() && query.type(0) != SQLITE_NULL)
            answer = static_cast<FiringAnswer>(query.integer(0));
    });
    return answer;
}

}  // namespace

std::vector<FiringRequest> openRequests(Connection& connection) {
    std::vector<FiringRequest> requests;
    Statement& query =
        connection.statement("SELECT number, identifier FROM activity_requests WHERE answer IS NULL ORDER BY number");
    while (query.step()) requests.push_back({query.integer(0), std::string(query.text(1))});
    return requests;
}

void answerRequest(Connection& connection, std::int64_t number, FiringAnswer answer) {
    connection.statement("UPDATE activity_requests SET answer = ? WHERE number = ?")
        .bind(0, static_cast<std::int64_t>(answer))
        .bind(1, number)
        .step();
}

// Without a condition SQLite would rewrite the table's page even when the table is empty, as it usually is.
void dropRequests(Connection& connection) {
    connection.execute("DELETE FROM activity_requests WHERE true");
}

// Stores the request before it touches the file that makes the agent look for it.
platform::Result<std::optional<FiringAnswer>> requestFiring(const std::string& home, Database& database,
                                                            std::string_view identifier, platform::Duration limit) {
    if (!HomeLock::isInUse(home)) return std::optional<FiringAnswer>();
    std::int64_t number = 0;
    const MaybeError error = database.write([&](Connection& connection) {
        connection.statement("INSERT INTO activity_requests (identifier) VALUES (?)").bind(0, identifier).step();
        number = connection.integer("SELECT last_insert_rowid()");
    });
    if (error) return *error;
    touch(home);

    const auto end = std::chrono::steady_clock::now() + limit;
    std::optional<FiringAnswer> answer;
    while (!(answer = answerTo(database, number)) && std::chrono::steady_clock::now() < end)
        std::this_thread::sleep_for(std::chrono::milliseconds(5));
    removeRequest(database, number);
    return answer;
}

}  // namespace vrx::host
