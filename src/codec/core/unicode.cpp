#include "vrx/codec/core/unicode.h"

#include <algorithm>

namespace vrx::codec {

namespace {

constexpr char32_t firstOfTwoUnits = 0x10000;

bool isSurrogate(char32_t unit) {
    return unit >= 0xD800 && unit <= 0xDFFF;
}

}  // namespace

bool isAscii(std::string_view text) {
    return std::ranges::all_of(text, [](char c) { return static_cast<unsigned char>(c) < 0x80; });
}

std::optional<std::u16string> utf16FromUtf8(std::string_view text) {
    std::u16string units;
    units.reserve(text.size());
    while (!text.empty()) {
        std::optional<char32_t> character = takeCharacter(text);
        if (!character) return std::nullopt;
        if (*character < firstOfTwoUnits) {
            units += static_cast<char16_t>(*character);
        } else {
            units += static_cast<char16_t>(0xD7C0u + (*character >> 10));
            units += static_cast<char16_t>(0xDC00u | (*character & 0x3FFu));
        }
    }
    return units;
}

std::optional<std::string> utf8FromUtf16(std::u16string_view units) {
    std::string text;
    text.reserve(units.size());
    for (std::size_t i = 0; i < units.size(); ++i) {
        char32_t character = units[i];
        if (isSurrogate(character)) {
            const bool paired = character < 0xDC00 && i + 1 < units.size() && (units[i + 1] & 0xFC00u) == 0xDC00;
            if (!paired) return std::nullopt;
            character = firstOfTwoUnits + ((character & 0x3FFu) << 10) + (units[++i] & 0x3FFu);
        }
        appendUtf8(text, character);
    }
    return text;
}

}  // namespace vrx::codec
