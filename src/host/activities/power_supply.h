// The machine's power supply. Each call reads it afresh; any thread may ask.
#pragma once

#include <string>

namespace vrx::host {

// Whether the machine runs on a battery that is low. False when it reports no battery. Tests pass another root than
// "/".
bool isOnLowBattery(const std::string& root = "");

}  // namespace vrx::host
