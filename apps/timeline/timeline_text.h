// A chronicle as text for people, for a terminal of 80 columns.
#pragma once

#include <string>

#include "timeline/chronicle.h"

namespace vrx::timeline {

std::string textOf(const Chronicle& chronicle);
// A list of what was taken for granted; empty where nothing was.
std::string assumptionsText(const Chronicle& chronicle);

}  // namespace vrx::timeline
