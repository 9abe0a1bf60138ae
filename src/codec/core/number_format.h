// Numbers as texts of a language. Any thread may call.
#pragma once

#include <cstdint>
#include <string>

namespace vrx::codec {

// A whole number in the decimal style of a locale such as "en_US", with its digits and grouping separators: 1,234. An
// unknown language gets the style common to all, which is that of English.
std::string decimalText(std::uint64_t number, const std::string& locale);

}  // namespace vrx::codec
