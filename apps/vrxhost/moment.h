// Moments that are named on the command line.
#pragma once

#include <optional>
#include <string>

#include "vrx/platform/date.h"

namespace vrx::apps {

// "2027-03-01" and "2027-03-01 10:14", in local time or with --utc in UTC; "2027-03-01T10:14:00Z"; and from now on,
// "+30d", "+12h", "+15m" or "+10s". Null for anything else.
std::optional<platform::Date> momentFrom(const std::string& text, platform::Date now);

// For options: says what is wrong with a text, or nothing.
std::string momentMistake(const std::string& text);

}  // namespace vrx::apps
