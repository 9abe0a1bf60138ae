// Dates as the headers of HTTP have them. A pure function.
#pragma once

#include <optional>
#include <string_view>

#include "vrx/platform/date.h"

namespace vrx::codec {

// A date in any of the three forms that headers use, all of which are in GMT. Null for anything else, such as the
// customary "0".
std::optional<platform::Date> parseHttpDate(std::string_view text);

}  // namespace vrx::codec
