// The form in which serial numbers are stored: in defaults keys, file names, lists and identifiers.
#pragma once

#include <string>
#include <string_view>

namespace vrx::platform {

// 64 lower-case hexadecimal digits of the SHA-256 of the text's UTF-8 bytes up to its first NUL.
std::string sha256Hash(std::string_view text);

}  // namespace vrx::platform
