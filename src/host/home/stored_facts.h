// Facts that the host stores in host.db, by name: for the next process, and for the tools beside the agent.
#pragma once

#include <optional>
#include <string>
#include <string_view>

#include "vrx/host/home/database.h"

namespace vrx::host {

namespace stored_facts {
inline constexpr std::string_view agentVersion = "agentVersion";    // for which the upgrade activity was fired
inline constexpr std::string_view boot = "boot";                    // for which the boot activity was fired
inline constexpr std::string_view language = "language";            // the effective one, as last notified
inline constexpr std::string_view profile = "profile";              // the profile's layers: a line each, absolute
inline constexpr std::string_view pairedWatches = "pairedWatches";  // a line for each watch, as last notified
}  // namespace stored_facts

// For tools. Nothing also when it cannot be read.
std::optional<std::string> storedFact(Database& database, std::string_view name);
// Within a transaction.
std::optional<std::string> storedFact(Connection& connection, std::string_view name);
void setStoredFact(Connection& connection, std::string_view name, std::string_view value);

}  // namespace vrx::host
