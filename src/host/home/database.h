// The host's one database, host.db in the agent's home: settings, and whatever else of the host must outlive the
// process. Any thread may use it, and any number of processes at once; readers never wait for a writer.
//
// A file that is damaged is set aside under another name and a fresh one made; a file that was replaced while it was
// open is opened again. Both leave a line in the log.
#pragma once

#include <sqlite3.h>
#include <sys/stat.h>

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

#include "vrx/platform/error.h"
#include "vrx/platform/value.h"

namespace vrx::host {

// How a failure travels from a statement to the end of its transaction; it never leaves Database.
class DatabaseError : public std::runtime_error {
public:
    DatabaseError(int code, const std::string& text) : std::runtime_error(text), code(code) {}
    const int code;  // SQLite's
};

// A prepared statement: bind, then step through its rows. Columns and parameters count from 0. What it hands out lives
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

    // Whether there is a (next) row.
    bool step();
    void reset();

    int type(int column) const { return sqlite3_column_type(statement_, column); }  // SQLITE_INTEGER…
    std::int64_t integer(int column) const { return sqlite3_column_int64(statement_, column); }
    double number(int column) const { return sqlite3_column_double(statement_, column); }
    std::string_view text(int column) const;
    std::span<const std::uint8_t> bytes(int column) const;

private:
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

    // Runs statements that give no rows of interest.
    void execute(const char* sql);
    // The statement of a literal, prepared at first need and unbound again at each call. It must not be in use.
    Statement& statement(const char* sql);
    std::int64_t integer(const char* sql);
    // While two marks are equal, no other connection of any process has committed in between.
    std::int64_t commitMark();

private:
    friend class Database;

    // Whether closing leaves the files as they are, as it does at first: a damaged database is to be set aside
    // untouched.
    void keepLogAtClose(bool keep);
    void checkSoundness();
    // A statement left within its rows would keep the transaction open.
    void endStatements();

    sqlite3* connection_ = nullptr;
    std::unordered_map<const char*, std::unique_ptr<Statement>> statements_;
};

class Database {
public:
    // Step n of the schema takes the database from version n to n + 1. A published step is never changed.
    using Schema = std::span<const char* const>;
    static const Schema currentSchema;

    // Nothing is opened before the first use, or open(). A write waits for other writers up to the limit.
    explicit Database(std::string path, Schema schema = currentSchema,
                      std::chrono::milliseconds busyLimit = std::chrono::seconds(5))
        : Database(std::move(path), schema, busyLimit, false) {}
    // For reading only. It changes no file: where one would have to be made, mended or migrated, it cannot be opened.
    static Database readOnly(std::string path, Schema schema = currentSchema) {
        return {std::move(path), schema, std::chrono::seconds(5), true};
    }
    ~Database();

    // An error names the file and the reason: it cannot be written, or a newer version of the program has made it.
    platform::MaybeError open();

    // Run the body within one transaction; an error undoes the whole of it. The body must not use the database again.
    platform::MaybeError read(const std::function<void(Connection&)>& body);
    platform::MaybeError write(const std::function<void(Connection&)>& body);

    // What a copy of something stored must still be equal to if it is to be current.
    struct Stamp {
        std::uint64_t opening = 0;  // none is 0
        std::int64_t mark = 0;
        bool operator==(const Stamp&) const = default;
    };
    // As read(), without a transaction, for one statement or for none: the body is told the stamp.
    platform::MaybeError peek(const std::function<void(Connection&, const Stamp&)>& body);

private:
    struct Opening;

    Database(std::string path, Schema schema, std::chrono::milliseconds busyLimit, bool isReadOnly);
    std::shared_ptr<Opening> opening(platform::MaybeError& error);
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
    platform::Error failed(const std::shared_ptr<Opening>& opening, const DatabaseError& error);

    const std::string path_;
    const Schema schema_;
    const std::chrono::milliseconds busyLimit_;
    const bool isReadOnly_;

    // One user each of the reading and the writing connection, over all openings; taken before mutex_.
    std::mutex reading_;
    std::mutex writing_;

    std::mutex mutex_;
    std::shared_ptr<Opening> opening_;
    std::uint64_t openings_ = 0;
    std::string lastFailure_;  // of opening, so that it is logged once
};

}  // namespace vrx::host
