// Helpers for text that the host reads or writes line by line.
#pragma once

#include <string_view>

namespace vrx::host {

// Removes blanks and line ends from both ends.
std::string_view trimmed(std::string_view text);
// Whether it holds no control character, so that it may stand on a line of its own or be a header's value.
bool isOneLine(std::string_view text);
// Whether it is valid as the name of a header.
bool isHeaderName(std::string_view text);

}  // namespace vrx::host
