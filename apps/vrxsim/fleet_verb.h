// The verb fleet: what the servers see of many devices, as text, document, CSV and picture.
#pragma once

#include "common/command_line.h"

namespace vrx::apps {

void addFleetVerb(CommandLine& line);

}  // namespace vrx::apps
