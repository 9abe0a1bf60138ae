// Helpers for text that is read or written line by line. Pure functions.
#pragma once

#include <string_view>

namespace vrx::codec {

// Removes blanks and line ends from both ends.
std::string_view trimmed(std::string_view text);
// Whether it holds no control character, so that it may stand on a line of its own or be a header's value.
bool isOneLine(std::string_view text);

}  // namespace vrx::codec
