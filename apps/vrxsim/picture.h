// What the servers see of a fleet as a drawing: for each server the requests a minute by what began them, one upon the
// other, over the days. SVG that needs no font and no script, and fits light and dark pages.
#pragma once

#include <string>

#include "vrxsim/fleet.h"

namespace vrx::simulation {

// Each life stands for so many devices. The title must be plain text.
std::string pictureOf(const Census& census, std::int64_t days, std::uint64_t devicesOfLife, const std::string& title);

}  // namespace vrx::simulation
