#include "vrx/codec/line_text.h"

#include <algorithm>

namespace vrx::codec {

std::string_view trimmed(std::string_view text) {
    constexpr std::string_view blanks = " \t\r\n";
    const std::size_t begin = text.find_first_not_of(blanks);
    if (begin == text.npos) return {};
    return text.substr(begin, text.find_last_not_of(blanks) + 1 - begin);
}

bool isOneLine(std::string_view text) {
    return std::ranges::none_of(text, [](char c) { return (c >= 0 && c < ' ') || c == '\x7f'; });
}

}  // namespace vrx::codec
