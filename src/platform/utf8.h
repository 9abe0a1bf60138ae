// Text in UTF-8, read strictly: no overlong forms, no surrogates, nothing beyond U+10FFFF. Any thread may call.
#pragma once

#include <optional>
#include <string>
#include <string_view>

namespace vrx::platform {

// Takes the first character off the text; nothing, and the text as it was, where it does not begin with valid UTF-8.
std::optional<char32_t> takeCharacter(std::string_view& rest);
void appendUtf8(std::string& text, char32_t character);
bool isUtf8(std::string_view text);

}  // namespace vrx::platform
