// The host's one database, host.db in the agent's home: settings, and whatever else of the host must outlive the
// process. Any number of threads and processes may use it; readers never wait for a writer.
//
// A damaged file is set aside under another name and replaced by a fresh one. A file that was replaced while it was
// open is opened again. Both are logged.
#pragma once

#include <sqlite3.h>
#include <sys/stat.h>

#include <array>
#include <chrono>
#include <cstdint>
#include <functional>
#include <memory>
#include <mutex>
#include <span>
#include <stdexcept>
#include <string>
#include <string_view>
#include <unordered_map>

#include "vrx/host/base/lock_wait.h"
#include "vrx/platform/error.h"
#include "vrx/platform/value.h"

namespace vrx::host {

// Carries a failure from a statement to the end of its transaction. Never leaves Database.
class DatabaseError : public std::runtime_error {
public:
    DatabaseError(int code, const std::string& text) : std::runtime_error(text), code(code) {}
    const int code;  // SQLite's
};

// A prepared statement: bind, then step through its rows. Columns and parameters count from 0. What it returns is valid
// until the next step.
class Statement {
public:
    Statement(sqlite3* connection, const char* sql);
    ~Statement() { sqlite3_finalize(statement_); }
    Statement(const Statement&) = delete;
    Statement& operator=(const Statement&) = delete;

    Statement& bind(int parameter, std::string_view text);
    Statement& bind(int parameter, std::int64_t number);
    Statement& bind(int parameter, double number);
    Statement& bind(int parameter, const platform::Data& bytes);
    Statement& bind(int parameter, std::nullptr_t);

    // Goes to the first or the next row. Returns whether there is one.
    bool step();
    void reset();

    int type(int column) const { return sqlite3_column_type(statement_, column); }  // SQLITE_INTEGER…
    std::int64_t integer(int column) const { return sqlite3_column_int64(statement_, column); }
    double number(int column) const { return sqlite3_column_double(statement_, column); }
    std::string_view text(int column) const;
    std::span<const std::uint8_t> bytes(int column) const;

private:
    // Tells a column that is empty from one for which there was no memory.
    void requireMemory() const;

    sqlite3* connection_;
    sqlite3_stmt* statement_ = nullptr;
};

// One connection to the database, used by one thread at a time.
class Connection {
public:
    Connection(const std::string& path, std::chrono::milliseconds busyLimit, bool isReadOnly = false);
    ~Connection();
    Connection(const Connection&) = delete;
    Connection& operator=(const Connection&) = delete;

    // Runs statements whose rows, if any, are ignored.
    void execute(const char* sql);
    // The statement of a string literal, prepared at its first use and with nothing bound. It must not be in use.
    Statement& statement(const char* sql);
    std::int64_t integer(const char* sql);
    // Two equal marks: nothing was committed in between, by any connection of any process. The mark is the header of
    // the database's shared index, which every commit replaces, and costs no system call.
    using CommitMark = std::array<std::uint32_t, 12>;
    CommitMark commitMark();

private:
    friend class Database;

    // Whether closing leaves all files as they are. True at first, so that a damaged database is set aside untouched.
    void keepLogAtClose(bool keep);
    void findIndexHeader();
    void checkSoundness();
    // Resets unfinished statements, which would keep the transaction open.
    void endStatements();

    static int onBusy(void* self, int attempts);

    sqlite3* connection_ = nullptr;
    const std::chrono::milliseconds busyLimit_;
    std::optional<LockWait> wait_;
    const std::uint32_t* indexHeader_ = nullptr;  // mapped by SQLite while the connection is open
    std::unordered_map<const char*, std::unique_ptr<Statement>> statements_;
};

class Database {
public:
    // Step n of the schema takes the database from version n to n + 1. A published step is never changed.
    using Schema = std::span<const char* const>;
    static const Schema currentSchema;

    // Opens nothing before the first use or open(). A write waits for other writers up to the limit, on a thread that
    // may wait (lock_wait.h).
    explicit Database(std::string path, Schema schema = currentSchema,
                      std::chrono::milliseconds busyLimit = std::chrono::seconds(5))
        : Database(std::move(path), schema, busyLimit, false) {}
    // For reading only. Changes no file: a database that would have to be made, repaired or migrated cannot be opened.
    static Database readOnly(std::string path, Schema schema = currentSchema) {
        return {std::move(path), schema, std::chrono::seconds(5), true};
    }
    ~Database();

    // The error names the file and the reason, for instance that a newer version of the program made it.
    platform::MaybeError open();

    // Runs the body in one transaction, which an error undoes as a whole. The body must not use the database again.
    platform::MaybeError read(const std::function<void(Connection&)>& body);
    platform::MaybeError write(const std::function<void(Connection&)>& body);

    // Identifies a state of the database. A copy made in that state is current while the stamp is the same.
    struct Stamp {
        std::uint64_t opening = 0;  // 0 when there is none
        Connection::CommitMark mark{};
        bool operator==(const Stamp&) const = default;
    };
    // Like read(), but without a transaction, for at most one statement. The body gets the present stamp.
    platform::MaybeError peek(const std::function<void(Connection&, const Stamp&)>& body);

private:
    struct Opening;

    Database(std::string path, Schema schema, std::chrono::milliseconds busyLimit, bool isReadOnly);
    // Whether another file has taken the path is looked at once a request; before each write, which must not be lost.
    enum class Look : bool { OnceARequest, Anew };
    std::shared_ptr<Opening> opening(platform::MaybeError& error, Look look = Look::OnceARequest);
    std::shared_ptr<Opening> openChecked();
    std::shared_ptr<Opening> openOnce() const;
    std::shared_ptr<Opening> openReadOnly() const;
    std::int64_t checkedVersion(Connection& connection) const;
    void migrate(Connection& writer) const;
    void leaveReplacedFile();
    std::string freeAsideName(const std::string& reason) const;
    void moveAside(const std::string& asideName, const char* suffix) const;
    platform::MaybeError transaction(Connection& connection, const std::shared_ptr<Opening>& opening, const char* begin,
                                     const std::function<void(Connection&)>& body);
    platform::Error busy() const;
    platform::Error failed(const std::shared_ptr<Opening>& opening, const DatabaseError& error);

    const std::string path_;
    const Schema schema_;
    const std::chrono::milliseconds busyLimit_;
    const bool isReadOnly_;

    // The reading and the writing connection have one user at a time, over all openings. Taken before mutex_.
    std::mutex reading_;
    std::mutex writing_;

    std::mutex mutex_;
    std::shared_ptr<Opening> opening_;
    std::uint64_t openings_ = 0;
    std::string lastFailure_;  // to open, so that it is logged once
};

}  // namespace vrx::host
