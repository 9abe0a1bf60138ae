#include "vrx/host/home/database.h"

#include <fcntl.h>
#include <sys/file.h>

#include <array>
#include <cerrno>
#include <cstdlib>
#include <cstring>
#include <ctime>
#include <thread>

#include "vrx/host/base/descriptor.h"
#include "vrx/host/base/files.h"
#include "vrx/host/base/request_scope.h"
#include "vrx/platform/log.h"

namespace vrx::host {

using platform::Error;
using platform::Level;
using platform::MaybeError;

namespace {

constexpr const char* steps[] = {
    // The agent's settings: a number or a text as itself, anything else as a binary property list.
    "CREATE TABLE defaults (key TEXT PRIMARY KEY, value NOT NULL) WITHOUT ROWID",
    // Follow-ups, in the order of their first posting: the item as a binary property list.
    "CREATE TABLE follow_ups (position INTEGER PRIMARY KEY, client TEXT NOT NULL, identifier TEXT NOT NULL, "
    "item NOT NULL, UNIQUE (client, identifier))",
    // Facts that the host keeps from one process to the next. The background activities that are scheduled, the last
    // run of each, and what testers ask the agent to fire.
    "CREATE TABLE host_facts (name TEXT PRIMARY KEY, value TEXT NOT NULL) WITHOUT ROWID;"
    "CREATE TABLE activities ("
    "    generation INTEGER PRIMARY KEY, identifier TEXT NOT NULL UNIQUE,"
    "    delay INTEGER NOT NULL, grace_period INTEGER NOT NULL, requires_network INTEGER NOT NULL,"
    "    due_boot TEXT NOT NULL, due_since_boot REAL NOT NULL, due_wall REAL NOT NULL, wait REAL NOT NULL,"
    "    is_carried_over INTEGER NOT NULL, deferrals INTEGER NOT NULL);"
    "CREATE TABLE activity_runs ("
    "    identifier TEXT PRIMARY KEY, generation INTEGER NOT NULL, began REAL NOT NULL, ended REAL, outcome INTEGER"
    ") WITHOUT ROWID;"
    "CREATE TABLE activity_requests ("
    "    number INTEGER PRIMARY KEY AUTOINCREMENT, identifier TEXT NOT NULL, answer INTEGER)",
    // Of the runs of each activity, more than the last one.
    "ALTER TABLE activity_runs RENAME TO last_runs;"
    "CREATE TABLE activity_runs ("
    "    number INTEGER PRIMARY KEY, identifier TEXT NOT NULL, generation INTEGER NOT NULL,"
    "    began REAL NOT NULL, ended REAL, outcome INTEGER);"
    "INSERT INTO activity_runs (identifier, generation, began, ended, outcome)"
    "    SELECT identifier, generation, began, ended, outcome FROM last_runs ORDER BY began;"
    "DROP TABLE last_runs",
};

void check(int result, sqlite3* connection) {
    if (result == SQLITE_OK) return;
    throw DatabaseError(result, connection ? sqlite3_errmsg(connection) : sqlite3_errstr(result));
}

bool isDamage(int code) {
    const int primary = code & 0xff;
    return primary == SQLITE_CORRUPT || primary == SQLITE_NOTADB;
}

// The code of the error that a row of quick_check names, in one of SQLite's two ways; 0 when it names none.
int errorCodeIn(std::string_view row) {
    for (const std::string_view name : {"error code=", "error code "}) {
        const auto at = row.find(name);
        if (at != std::string_view::npos) return std::atoi(std::string(row.substr(at + name.size())).c_str());
    }
    return 0;
}

std::string timeSuffix() {
    const std::time_t now = std::time(nullptr);
    std::tm fields{};
    gmtime_r(&now, &fields);
    std::array<char, 32> text;
    return {text.data(), std::strftime(text.data(), text.size(), "%Y%m%dT%H%M%SZ", &fields)};
}

// Which file a path leads to.
struct FileIdentity {
    dev_t device = 0;
    ino_t inode = 0;
    bool operator==(const FileIdentity&) const = default;
    explicit operator bool() const { return inode != 0; }

    // Empty when there is no file; absent when that cannot be told, which says nothing of the file.
    static std::optional<FileIdentity> of(const std::string& path) {
        struct stat status;
        if (stat(path.c_str(), &status) == 0) return FileIdentity{status.st_dev, status.st_ino};
        if (errno == ENOENT || errno == ENOTDIR) return FileIdentity{};
        return std::nullopt;
    }
    // For what must not be done on a guess.
    static FileIdentity known(const std::string& path) {
        if (const auto identity = of(path)) return *identity;
        throw DatabaseError(SQLITE_IOERR_FSTAT, systemError("look at", path, errno).text);
    }
};

// Held while the database is opened, and while it is tidied up at closing: of several processes that find it damaged,
// the first sets it aside and the others find the fresh one; and nobody who opens it finds its log without its index.
class FolderLock {
public:
    FolderLock(const std::string& path, std::chrono::milliseconds limit) {
        const std::string folder = path.substr(0, path.rfind('/') + 1);
        file_ = Descriptor(::open(folder.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
        if (!file_) throw DatabaseError(SQLITE_CANTOPEN, systemError("open", folder, errno).text);
        const LockWait wait(limit);
        while (flock(file_.number(), LOCK_EX | LOCK_NB) != 0) {
            if (errno != EWOULDBLOCK && errno != EINTR)
                throw DatabaseError(SQLITE_IOERR_LOCK, systemError("lock", folder, errno).text);
            if (!wait.again()) throw DatabaseError(SQLITE_BUSY, "another process keeps " + folder + " locked");
        }
    }

private:
    Descriptor file_;
};

// Keeps SQLite small: the whole database is some ten pages, and by default each connection would reserve memory for
// twenty pages and for the statements of a busy server.
bool configure() {
    return sqlite3_config(SQLITE_CONFIG_PAGECACHE, nullptr, 0, 0) == SQLITE_OK &&
           sqlite3_config(SQLITE_CONFIG_LOOKASIDE, 512, 16) == SQLITE_OK;
}

// Creates the file for its user alone, as SQLite would not. The files that SQLite makes beside it get the same mode.
void createPrivately(const std::string& path) {
    const Descriptor file(::open(path.c_str(), O_RDWR | O_CREAT | O_EXCL | O_CLOEXEC, 0600));
    if (!file && errno != EEXIST) throw DatabaseError(SQLITE_CANTOPEN, systemError("create", path, errno).text);
}

// For read-only access. With a log beside the database, SQLite reads the shared index, or builds one in memory when no
// process keeps it; without a log it needs no index. A process that was killed while it opened the database can leave
// an empty log without an index, or one that ends with its header, which SQLite would read again and again for ten
// seconds.
std::string readOnlyUri(const std::string& path) {
    std::string uri = "file:";
    for (const char character : path) {
        if (character == '%' || character == '?' || character == '#')
            uri.append(character == '%' ? "%25" : character == '?' ? "%3f" : "%23");
        else
            uri.push_back(character);
    }
    const std::string log = path + "-wal";
    constexpr off_t headerBytes = 32;
    struct stat status {};
    const bool hasLog = static_cast<bool>(FileIdentity::known(log));
    const bool isVoid = hasLog && stat(log.c_str(), &status) == 0 &&
                        (status.st_size == headerBytes || (status.st_size == 0 && !FileIdentity::known(path + "-shm")));
    return uri + (hasLog && !isVoid ? "?readonly_shm=1" : "?immutable=1");
}

}  // namespace

const Database::Schema Database::currentSchema = steps;

namespace {

// Who may only look can meet the shared index while a writer replaces its header, and then takes it for one that has to
// be recovered. One that really has to stays so.
template <class Call>
int resultOfLook(Call call) {
    constexpr int mostLooks = 50;
    int result = call();
    for (int look = 1; result == SQLITE_READONLY_RECOVERY && look < mostLooks; ++look) {
        std::this_thread::sleep_for(std::chrono::milliseconds(1));
        result = call();
    }
    return result;
}

}  // namespace

Statement::Statement(sqlite3* connection, const char* sql) : connection_(connection) {
    check(resultOfLook(
              [&] { return sqlite3_prepare_v3(connection, sql, -1, SQLITE_PREPARE_PERSISTENT, &statement_, nullptr); }),
          connection);
}

Statement& Statement::bind(int parameter, std::string_view text) {
    // A null pointer would bind null.
    check(sqlite3_bind_text64(statement_, parameter + 1, text.data() ? text.data() : "", text.size(), SQLITE_TRANSIENT,
                              SQLITE_UTF8),
          connection_);
    return *this;
}

Statement& Statement::bind(int parameter, std::int64_t number) {
    check(sqlite3_bind_int64(statement_, parameter + 1, number), connection_);
    return *this;
}

Statement& Statement::bind(int parameter, double number) {
    check(sqlite3_bind_double(statement_, parameter + 1, number), connection_);
    return *this;
}

Statement& Statement::bind(int parameter, const platform::Data& bytes) {
    const void* start = bytes.empty() ? static_cast<const void*>("") : bytes.data();
    check(sqlite3_bind_blob64(statement_, parameter + 1, start, bytes.size(), SQLITE_TRANSIENT), connection_);
    return *this;
}

Statement& Statement::bind(int parameter, std::nullptr_t) {
    check(sqlite3_bind_null(statement_, parameter + 1), connection_);
    return *this;
}

bool Statement::step() {
    const int result = resultOfLook([this] { return sqlite3_step(statement_); });
    if (result == SQLITE_ROW) return true;
    if (result != SQLITE_DONE) check(result, connection_);
    return false;
}

void Statement::reset() {
    sqlite3_reset(statement_);
    sqlite3_clear_bindings(statement_);
}

std::string_view Statement::text(int column) const {
    const auto* start = reinterpret_cast<const char*>(sqlite3_column_text(statement_, column));
    if (!start) requireMemory();  // a text gets its final zero in a copy
    return {start ? start : "", static_cast<std::size_t>(sqlite3_column_bytes(statement_, column))};
}

std::span<const std::uint8_t> Statement::bytes(int column) const {
    const auto* start = static_cast<const std::uint8_t*>(sqlite3_column_blob(statement_, column));
    if (!start) requireMemory();
    return {start, start ? static_cast<std::size_t>(sqlite3_column_bytes(statement_, column)) : 0};
}

void Statement::requireMemory() const {
    if (sqlite3_errcode(connection_) == SQLITE_NOMEM) throw DatabaseError(SQLITE_NOMEM, sqlite3_errmsg(connection_));
}

Connection::Connection(const std::string& path, std::chrono::milliseconds busyLimit, bool isReadOnly)
    : busyLimit_(busyLimit) {
    static const bool isConfigured = configure();
    static_cast<void>(isConfigured);
    const int flags = isReadOnly ? SQLITE_OPEN_READONLY | SQLITE_OPEN_URI : SQLITE_OPEN_READWRITE;
    const int result = sqlite3_open_v2((isReadOnly ? readOnlyUri(path) : path).c_str(), &connection_,
                                       flags | SQLITE_OPEN_NOMUTEX, nullptr);
    try {
        check(result, connection_);
        sqlite3_extended_result_codes(connection_, 1);
        keepLogAtClose(true);
        sqlite3_busy_handler(connection_, onBusy, this);
        execute("PRAGMA synchronous = FULL");
    } catch (...) {
        sqlite3_close(connection_);
        throw;
    }
}

// Called for each attempt that has failed, the first of a row with 0.
int Connection::onBusy(void* userdata, int attempts) {
    auto& self = *static_cast<Connection*>(userdata);
    if (attempts == 0) self.wait_.emplace(self.busyLimit_);
    return self.wait_->again() ? 1 : 0;
}

Connection::~Connection() {
    statements_.clear();
    sqlite3_close(connection_);
}

void Connection::keepLogAtClose(bool keep) {
    sqlite3_db_config(connection_, SQLITE_DBCONFIG_NO_CKPT_ON_CLOSE, keep ? 1 : 0, nullptr);
}

void Connection::execute(const char* sql) {
    check(resultOfLook([&] { return sqlite3_exec(connection_, sql, nullptr, nullptr, nullptr); }), connection_);
}

Statement& Connection::statement(const char* sql) {
    std::unique_ptr<Statement>& statement = statements_[sql];
    if (!statement)
        statement = std::make_unique<Statement>(connection_, sql);
    else
        statement->reset();
    return *statement;
}

std::int64_t Connection::integer(const char* sql) {
    Statement& query = statement(sql);
    const std::int64_t result = query.step() ? query.integer(0) : 0;
    query.reset();
    return result;
}

// A page that could not be read, or for which there was no memory, is reported in a row as well, and may bring on rows
// that look like damage: then nothing is known of the file.
void Connection::checkSoundness() {
    Statement check(connection_, "PRAGMA quick_check");
    std::string firstRow;
    while (check.step()) {
        const std::string row(check.text(0));
        if (const int code = errorCodeIn(row); code != 0 && !isDamage(code)) throw DatabaseError(code, row);
        if (firstRow.empty()) firstRow = row;
    }
    if (firstRow != "ok") throw DatabaseError(SQLITE_CORRUPT, firstRow);
}

void Connection::endStatements() {
    for (sqlite3_stmt* used = sqlite3_next_stmt(connection_, nullptr); used;
         used = sqlite3_next_stmt(connection_, used))
        if (sqlite3_stmt_busy(used)) sqlite3_reset(used);
}

// Both the shared-memory method and the header's place and size, 48 bytes at the beginning, are part of SQLite's
// published interfaces and formats; SQLite itself compares the header to tell whether its cache is current.
void Connection::findIndexHeader() {
    constexpr int regionBytes = 32768;
    integer("PRAGMA user_version");  // a read is what makes it map the index
    sqlite3_file* file = nullptr;
    void volatile* region = nullptr;
    check(sqlite3_file_control(connection_, "main", SQLITE_FCNTL_FILE_POINTER, &file), connection_);
    if (file->pMethods->iVersion >= 2) file->pMethods->xShmMap(file, 0, regionBytes, 0, &region);
    indexHeader_ = static_cast<const std::uint32_t*>(const_cast<void*>(region));
}

Connection::CommitMark Connection::commitMark() {
    CommitMark mark{};
    if (!indexHeader_) {  // a file system without shared memory
        mark[0] = static_cast<std::uint32_t>(integer("PRAGMA data_version"));
        return mark;
    }
    // Another process may be writing it: a mixture of old and new equals neither.
    for (std::size_t i = 0; i < mark.size(); ++i) mark[i] = __atomic_load_n(indexHeader_ + i, __ATOMIC_ACQUIRE);
    return mark;
}

// The connections of one opening. Reading has its own, so that it does not wait while a write waits.
struct Database::Opening {
    Opening(const std::string& path, std::chrono::milliseconds busyLimit) : path(path), busyLimit(busyLimit) {}

    ~Opening() {
        if (writer && tidyUp()) return;
        for (auto* connection : {&writer, &reader})
            if (*connection) (*connection)->keepLogAtClose(true);
    }

    // Closing the last connection removes the -wal file by its name. When another database has taken this path, that
    // file is not ours; nor may it go while that cannot be told, or while another process opens the database.
    bool tidyUp() noexcept {
        try {
            if (FileIdentity::of(path) != file) return false;
            const FolderLock lock(path, busyLimit);
            reader.reset();
            writer.reset();
            return true;
        } catch (const DatabaseError&) {
            return false;
        }
    }

    // Called once the database is known to be sound: opens it for reading, and lets closing tidy it up.
    void passed() {
        reader.emplace(path, busyLimit);
        reader->findIndexHeader();
        wal = FileIdentity::known(path + "-wal");
        shm = FileIdentity::known(path + "-shm");
        file = FileIdentity::known(path);  // last: who fails before is closed under the lock of its opening
        for (auto* connection : {&writer, &reader}) (*connection)->keepLogAtClose(false);
    }

    const std::string path;
    const std::chrono::milliseconds busyLimit;
    std::optional<Connection> writer;  // absent when read-only
    std::optional<Connection> reader;
    FileIdentity file, wal, shm;
    std::uint64_t number = 0;
};

Database::Database(std::string path, Schema schema, std::chrono::milliseconds busyLimit, bool isReadOnly)
    : path_(std::move(path)), schema_(schema), busyLimit_(busyLimit), isReadOnly_(isReadOnly) {}

Database::~Database() = default;

MaybeError Database::open() {
    MaybeError error;
    opening(error);
    return error;
}

std::shared_ptr<Database::Opening> Database::opening(MaybeError& error, Look look) {
    const auto lock = LockWait::take(mutex_);
    if (!lock) {
        error = busy();
        return nullptr;
    }
    if (opening_) {
        if (!RequestScope::isFirstLook(this) && look == Look::OnceARequest) return opening_;
        const auto present = FileIdentity::of(path_);
        if (!present || *present == opening_->file) return opening_;
    }
    try {
        const FolderLock folder(path_, busyLimit_);
        if (opening_) leaveReplacedFile();
        opening_ = openChecked();
        opening_->number = ++openings_;
        lastFailure_.clear();
        return opening_;
    } catch (const DatabaseError& failure) {
        error = Error{platform::error_domain::database, failure.code, "cannot open " + path_ + ": " + failure.what()};
        if (std::exchange(lastFailure_, error->text) != error->text) log(Level::Error, "%@", error->text);
        return nullptr;
    }
}

// Sets the -wal and -shm files of the replaced database aside, because the new one would take them for its own. Files
// that came with the new one stay.
void Database::leaveReplacedFile() {
    log(Level::Error, "%@ was replaced and is opened again", path_);
    const std::string aside = freeAsideName("replaced");
    if (FileIdentity::known(path_ + "-wal") == opening_->wal) moveAside(aside, "-wal");
    if (FileIdentity::known(path_ + "-shm") == opening_->shm) moveAside(aside, "-shm");
    opening_.reset();
}

std::shared_ptr<Database::Opening> Database::openChecked() {
    if (isReadOnly_) return openReadOnly();
    try {
        return openOnce();
    } catch (const DatabaseError& error) {
        if (!isDamage(error.code)) throw;
    }
    try {
        return openOnce();  // one look alone proves no damage
    } catch (const DatabaseError& error) {
        if (!isDamage(error.code)) throw;
        const std::string aside = freeAsideName("damaged");
        for (const char* suffix : {"-wal", "-shm", ""}) moveAside(aside, suffix);
        log(Level::Error, "%@ is damaged (%@); it was set aside as %@ and a new one is made", path_, error.what(),
            aside);
        return openOnce();
    }
}

std::shared_ptr<Database::Opening> Database::openOnce() const {
    createPrivately(path_);
    auto opening = std::make_shared<Opening>(path_, busyLimit_);
    Connection& writer = opening->writer.emplace(path_, busyLimit_);
    writer.execute("PRAGMA journal_mode = WAL");
    writer.checkSoundness();
    migrate(writer);
    opening->passed();
    return opening;
}

std::shared_ptr<Database::Opening> Database::openReadOnly() const {
    auto opening = std::make_shared<Opening>(path_, busyLimit_);
    Connection& reader = opening->reader.emplace(path_, busyLimit_, true);
    reader.checkSoundness();
    if (checkedVersion(reader) < static_cast<std::int64_t>(schema_.size()))
        throw DatabaseError(SQLITE_ERROR,
                            "it was made by an older version of the program, and the agent has not taken it over yet");
    opening->file = FileIdentity::known(path_);
    return opening;
}

std::int64_t Database::checkedVersion(Connection& connection) const {
    const auto newest = static_cast<std::int64_t>(schema_.size());
    const std::int64_t version = connection.integer("PRAGMA user_version");
    if (version <= newest && version >= 0) return version;
    throw DatabaseError(SQLITE_ERROR, "it was made by a newer version of the program (schema " +
                                          std::to_string(version) + "; this one knows " + std::to_string(newest) + ")");
}

void Database::migrate(Connection& writer) const {
    const auto newest = static_cast<std::int64_t>(schema_.size());
    if (checkedVersion(writer) == newest) return;  // does not wait for a writer
    writer.execute("BEGIN IMMEDIATE");
    const std::int64_t version = checkedVersion(writer);
    for (std::int64_t step = version; step < newest; ++step) writer.execute(schema_[static_cast<std::size_t>(step)]);
    if (version < newest) writer.execute(("PRAGMA user_version = " + std::to_string(newest)).c_str());
    writer.execute("COMMIT");
}

std::string Database::freeAsideName(const std::string& reason) const {
    const std::string name = path_ + "." + reason + "-" + timeSuffix();
    auto isTaken = [](const std::string& candidate) {
        for (const char* suffix : {"", "-wal", "-shm"})
            if (FileIdentity::known(candidate + suffix)) return true;
        return false;
    };
    std::string candidate = name;
    for (int number = 2; isTaken(candidate); ++number) candidate = name + "-" + std::to_string(number);
    return candidate;
}

void Database::moveAside(const std::string& asideName, const char* suffix) const {
    const std::string from = path_ + suffix;
    if (::rename(from.c_str(), (asideName + suffix).c_str()) != 0 && errno != ENOENT)
        throw DatabaseError(SQLITE_CANTOPEN, systemError("set aside", from, errno).text);
}

Error Database::busy() const {
    return Error{platform::error_domain::database, SQLITE_BUSY, path_ + ": it is in use"};
}

// After damage that shows in use, the next operation opens the database again and examines it. So it does after a call
// that failed: what SQLite could not unlock would stay locked for as long as the connections are open.
Error Database::failed(const std::shared_ptr<Opening>& opening, const DatabaseError& error) {
    const int primary = error.code & 0xff;
    if (isDamage(error.code) || primary == SQLITE_IOERR || primary == SQLITE_PROTOCOL) {
        const std::lock_guard lock(mutex_);
        if (opening_ == opening) opening_.reset();
    }
    return Error{platform::error_domain::database, error.code, path_ + ": " + error.what()};
}

// A statement left unfinished would block COMMIT and ROLLBACK, so all are ended first.
MaybeError Database::transaction(Connection& connection, const std::shared_ptr<Opening>& opening, const char* begin,
                                 const std::function<void(Connection&)>& body) {
    try {
        connection.execute(begin);
        body(connection);
        connection.endStatements();
        connection.execute("COMMIT");
        return std::nullopt;
    } catch (const DatabaseError& error) {
        connection.endStatements();
        // Some failures roll back by themselves.
        if (!sqlite3_get_autocommit(connection.connection_))
            sqlite3_exec(connection.connection_, "ROLLBACK", nullptr, nullptr, nullptr);
        return failed(opening, error);
    }
}

MaybeError Database::read(const std::function<void(Connection&)>& body) {
    const auto lock = LockWait::take(reading_);
    if (!lock) return busy();
    MaybeError error;
    std::shared_ptr<Opening> current = opening(error);
    return current ? transaction(*current->reader, current, "BEGIN", body) : error;
}

MaybeError Database::write(const std::function<void(Connection&)>& body) {
    const auto lock = LockWait::take(writing_);
    if (!lock) return busy();
    MaybeError error;
    std::shared_ptr<Opening> current = opening(error, Look::Anew);
    if (current && !current->writer)
        error = Error{platform::error_domain::database, SQLITE_READONLY, path_ + ": is only looked at"};
    return error ? error : transaction(*current->writer, current, "BEGIN IMMEDIATE", body);
}

MaybeError Database::peek(const std::function<void(Connection&, const Stamp&)>& body) {
    const auto lock = LockWait::take(reading_);
    if (!lock) return busy();
    MaybeError error;
    std::shared_ptr<Opening> current = opening(error);
    if (!current) return error;
    Connection& reader = *current->reader;
    try {
        body(reader, Stamp{current->number, reader.commitMark()});
        reader.endStatements();
        return std::nullopt;
    } catch (const DatabaseError& failure) {
        reader.endStatements();
        return failed(current, failure);
    }
}

}  // namespace vrx::host
