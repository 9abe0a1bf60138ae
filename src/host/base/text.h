// Small questions about text that the host reads or writes a line at a time.
#pragma once

#include <string_view>

namespace vrx::host {

// Without the blanks and line ends at both ends.
std::string_view trimmed(std::string_view text);
// Whether it holds no control character: it may stand in a line of its own, or be a header's value.
bool isOneLine(std::string_view text);
// Whether it can be a header's name.
bool isHeaderName(std::string_view text);

}  // namespace vrx::host
