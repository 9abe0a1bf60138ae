#include "vrx/host/home/defaults_store.h"

#include <cmath>

#include "vrx/codec/property_list.h"
#include "vrx/platform/log.h"

namespace vrx::host {

using platform::Data;
using platform::Dictionary;
using platform::Level;
using platform::MaybeError;
using platform::Result;
using platform::Value;

namespace {

// Bounds the memory that clients can fill with made-up serial numbers.
constexpr std::size_t mostCopies = 1000;

constexpr const char* selectOne = "SELECT value FROM defaults WHERE key = ?";
constexpr const char* selectAll = "SELECT value, key FROM defaults";
constexpr const char* replace =
    "INSERT INTO defaults (key, value) VALUES (?, ?) "
    "ON CONFLICT (key) DO UPDATE SET value = excluded.value";
constexpr const char* removeOne = "DELETE FROM defaults WHERE key = ?";

// The value in column 0. Null, with a line in the log, when it cannot be read.
Value storedValue(const Statement& row, std::string_view key) {
    switch (row.type(0)) {
        case SQLITE_INTEGER: return row.integer(0);
        case SQLITE_FLOAT: return row.number(0);
        case SQLITE_TEXT: return row.text(0);
        default: break;
    }
    const std::span<const std::uint8_t> bytes = row.bytes(0);
    Result<Value> value = codec::parsePropertyList(Data(bytes.begin(), bytes.end()));
    if (value) return *value;
    log(Level::Error, "The setting %@ cannot be read: %@", key, value.error());
    return nullptr;
}

void bindValue(Statement& statement, int parameter, const Value& value) {
    const std::optional<double> number = value.asNumber();
    if (std::optional<std::int64_t> integer = value.asInteger()) {
        statement.bind(parameter, *integer);
    } else if (number && !std::isnan(*number)) {  // SQLite stores NaN as null
        statement.bind(parameter, *number);
    } else if (const std::string* text = value.asString()) {
        statement.bind(parameter, std::string_view(*text));
    } else {
        Result<Data> bytes = codec::serializePropertyList(value, platform::PropertyListFormat::Binary);
        if (!bytes) throw DatabaseError(SQLITE_MISMATCH, bytes.error().text);
        statement.bind(parameter, *bytes);
    }
}

Value load(Connection& connection, std::string_view key) {
    Statement& query = connection.statement(selectOne).bind(0, key);
    return query.step() ? storedValue(query, key) : Value();
}

void store(Connection& connection, std::string_view key, const Value& value) {
    if (value.isNull()) {
        connection.statement(removeOne).bind(0, key).step();
        return;
    }
    Statement& statement = connection.statement(replace).bind(0, key);
    bindValue(statement, 1, value);
    statement.step();
}

void logFailure(const MaybeError& error, const char* action, std::string_view key) {
    if (error) log(Level::Error, "Cannot %s the setting %@: %@", action, key, *error);
}

}  // namespace

Value DefaultsStore::get(std::string_view key) const {
    Value value;
    logFailure(database_.peek([&](Connection& connection, const Database::Stamp& stamp) {
        if (stamp != copies_.stamp || copies_.values.size() >= mostCopies) copies_ = {stamp, {}};
        auto copy = copies_.values.find(key);
        if (copy == copies_.values.end()) copy = copies_.values.emplace(key, load(connection, key)).first;
        value = copy->second;
    }),
               "read", key);
    return value.isNull() ? unwritten(key) : value;
}

void DefaultsStore::set(std::string_view key, Value value) {
    logFailure(write(key, value), "write", key);
}

MaybeError DefaultsStore::write(std::string_view key, const Value& value) {
    return database_.write([&](Connection& connection) { store(connection, key, value); });
}

void DefaultsStore::update(std::string_view key, const std::function<Value(const Value&)>& change) {
    logFailure(rewrite(key, change), "write", key);
}

MaybeError DefaultsStore::rewrite(std::string_view key, const std::function<Value(const Value&)>& change) {
    return database_.write([&](Connection& connection) {
        Value present = load(connection, key);
        store(connection, key, change(present.isNull() ? unwritten(key) : present));
    });
}

void DefaultsStore::registerDefaults(const Dictionary& values) {
    std::lock_guard lock(mutex_);
    for (const auto& [key, value] : values) registered_[key] = value;
}

Dictionary DefaultsStore::dictionaryRepresentation() const {
    Dictionary all;
    {
        std::lock_guard lock(mutex_);
        all = registered_;
    }
    // Held, for the profile may be read anew meanwhile.
    if (const std::shared_ptr<const Dictionary> presets = presets_ ? presets_() : nullptr)
        for (const auto& [key, value] : *presets) all[key] = value;
    logFailure(database_.read([&](Connection& connection) {
        for (const auto& [key, value] : storedSettings(connection)) all[key] = value;
    }),
               "read", "list");
    return all;
}

Dictionary storedSettings(Connection& connection) {
    Dictionary settings;
    Statement& rows = connection.statement(selectAll);
    while (rows.step())
        if (Value value = storedValue(rows, rows.text(1)); !value.isNull()) settings[std::string(rows.text(1))] = value;
    return settings;
}

Value DefaultsStore::unwritten(std::string_view key) const {
    if (presets_) {
        const std::shared_ptr<const Dictionary> presets = presets_();
        if (const auto preset = presets->find(key); preset != presets->end()) return preset->second;
    }
    std::lock_guard lock(mutex_);
    auto entry = registered_.find(key);
    return entry == registered_.end() ? Value() : entry->second;
}

}  // namespace vrx::host
