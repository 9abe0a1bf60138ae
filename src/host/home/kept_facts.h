// What the machine's services have told of who the device is. These facts must not change because a service is slow to
// answer, or away: the last answer is kept in the home and holds until there is another. It is kept with the machine
// that it belongs to, and does not count on another one.
#pragma once

#include <string>

#include "vrx/host/base/told_facts.h"
#include "vrx/host/home/database.h"

namespace vrx::host {

// Both within a transaction. The machine is any text that identifies it; only a hash is stored. What cannot be read
// is absent.
ToldFacts keptFacts(Connection& connection, const std::string& machine);
void keepFacts(Connection& connection, const std::string& machine, const ToldFacts& facts);

}  // namespace vrx::host
