// Dates as ISO 8601 text in UTC, to the second: 2026-01-31T12:00:00Z. Any thread may call.
#pragma once

#include <optional>
#include <string>
#include <string_view>

#include "vrx/platform/date.h"

namespace vrx::codec {

// A fraction of a second is dropped. Null outside the years 1 to 9999.
std::optional<std::string> isoTextFromDate(platform::Date date);
std::optional<platform::Date> dateFromIsoText(std::string_view text);

}  // namespace vrx::codec
