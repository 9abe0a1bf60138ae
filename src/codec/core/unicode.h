// UTF-8 to UTF-16 and back, strictly: no overlong forms, no lone surrogates, nothing beyond U+10FFFF. Any thread may
// call.
#pragma once

#include <optional>
#include <string>
#include <string_view>

#include "vrx/platform/utf8.h"

namespace vrx::codec {

using platform::appendUtf8;
using platform::takeCharacter;

bool isAscii(std::string_view text);
std::optional<std::u16string> utf16FromUtf8(std::string_view text);
std::optional<std::string> utf8FromUtf16(std::u16string_view text);

}  // namespace vrx::codec
