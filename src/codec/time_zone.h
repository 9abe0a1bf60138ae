// Offsets of time zones, by their names in the time-zone database. Any thread may call.
#pragma once

#include <chrono>
#include <optional>
#include <string>

#include "vrx/platform/date.h"

namespace vrx::codec {

// How far the local time of a zone such as "Europe/Berlin" is ahead of GMT at the date; null for an unknown name.
std::optional<std::chrono::seconds> timeZoneOffset(const std::string& zone, platform::Date at);

}  // namespace vrx::codec
