// Text in UTF-8, read strictly: no overlong forms, no surrogates, nothing beyond U+10FFFF. Any thread may call.
#pragma once

#include <optional>
#include <string>
#include <string_view>

namespace vrx::platform {

// Removes the first character from the text and returns it. A text that does not begin with valid UTF-8 stays as it is,
// and the result is null.
std::optional<char32_t> takeCharacter(std::string_view& rest);
void appendUtf8(std::string& text, char32_t character);
bool isUtf8(std::string_view text);

}  // namespace vrx::platform
