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
// Whether it is made as the identifiers of applications are, "com.example.Viewer", so that it may stand in the name of
// a file as it is: at most 255 letters, digits, dashes, underscores and dots, no dot in front.
bool isApplicationIdentifier(std::string_view text);

}  // namespace vrx::host
