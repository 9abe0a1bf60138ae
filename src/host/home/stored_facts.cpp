#include "vrx/host/home/stored_facts.h"

namespace vrx::host {

std::optional<std::string> storedFact(Database& database, std::string_view name) {
    std::optional<std::string> value;
    database.read([&](Connection& connection) { value = storedFact(connection, name); });
    return value;
}

std::optional<std::string> storedFact(Connection& connection, std::string_view name) {
    Statement& query = connection.statement("SELECT value FROM host_facts WHERE name = ?");
    if (!query.bind(0, name).step()) return std::nullopt;
    return std::string(query.text(0));
}

// An equal value is not written, which spares most starts a sync of the disk.
void setStoredFact(Connection& connection, std::string_view name, std::string_view value) {
    connection
        .statement(
            "INSERT INTO host_facts VALUES (?, ?) ON CONFLICT (name) DO UPDATE SET value = excluded.value "
            "WHERE value <> excluded.value")
        .bind(0, name)
        .bind(1, value)
        .step();
}

}  // namespace vrx::host
