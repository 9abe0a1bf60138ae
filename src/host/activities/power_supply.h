// What the machine runs on. Each call reads it afresh; any thread may ask.
#pragma once

#include <string>

namespace vrx::host {

// Whether it runs on a battery that is low. A machine that says nothing of batteries does not. The root is another than
// "/" in tests.
bool isOnLowBattery(const std::string& root = "");

}  // namespace vrx::host
