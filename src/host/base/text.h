// Helpers for text that the host reads or writes line by line.
#pragma once

#include <string_view>

#include "vrx/codec/line_text.h"

namespace vrx::host {

using codec::isOneLine;
using codec::trimmed;
// Whether it is valid as the name of a header.
bool isHeaderName(std::string_view text);
// Whether it is made as the identifiers of applications are, "com.example.Viewer", so that it may stand in the name of
// a file as it is: at most 255 letters, digits, dashes, underscores and dots, no dot in front.
bool isApplicationIdentifier(std::string_view text);

}  // namespace vrx::host
