#include "codec/unicode.h"

#include <algorithm>

namespace vrx::codec {

namespace {

constexpr char32_t firstOfTwoBytes = 0x80, firstOfThree = 0x800, firstOfFour = 0x10000, last = 0x10FFFF;

bool isSurrogate(char32_t unit) {
    return unit >= 0xD800 && unit <= 0xDFFF;
}

}  // namespace

std::optional<char32_t> takeCharacter(std::string_view& rest) {
    if (rest.empty()) return std::nullopt;
    auto byte = [&](std::size_t i) { return static_cast<char32_t>(static_cast<unsigned char>(rest[i])); };
    const char32_t lead = byte(0);
    if (lead < firstOfTwoBytes) {
        rest.remove_prefix(1);
        return lead;
    }
    const std::size_t length = lead >= 0xF0 ? 4 : lead >= 0xE0 ? 3 : 2;
    if (lead < 0xC2 || lead > 0xF4 || rest.size() < length) return std::nullopt;

    char32_t character = lead & (0x7Fu >> length);
    for (std::size_t i = 1; i < length; ++i) {
        if ((byte(i) & 0xC0u) != 0x80) return std::nullopt;
        character = character << 6 | (byte(i) & 0x3Fu);
    }
    const char32_t least = length == 4 ? firstOfFour : length == 3 ? firstOfThree : firstOfTwoBytes;
    if (character < least || character > last || isSurrogate(character)) return std::nullopt;
    rest.remove_prefix(length);
    return character;
}

void appendUtf8(std::string& text, char32_t character) {
    auto append = [&](char32_t byte) { text += static_cast<char>(byte); };
    auto appendTail = [&](unsigned shift) { append(0x80u | (character >> shift & 0x3Fu)); };
    if (character < firstOfTwoBytes) {
        append(character);
    } else if (character < firstOfThree) {
        append(0xC0u | character >> 6);
        appendTail(0);
    } else if (character < firstOfFour) {
        append(0xE0u | character >> 12);
        appendTail(6);
        appendTail(0);
    } else {
        append(0xF0u | character >> 18);
        appendTail(12);
        appendTail(6);
        appendTail(0);
    }
}

bool isAscii(std::string_view text) {
    return std::ranges::all_of(text, [](char c) { return static_cast<unsigned char>(c) < 0x80; });
}

bool isUtf8(std::string_view text) {
    while (!text.empty())
        if (!takeCharacter(text)) return false;
    return true;
}

std::optional<std::u16string> utf16FromUtf8(std::string_view text) {
    std::u16string units;
    units.reserve(text.size());
    while (!text.empty()) {
        std::optional<char32_t> character = takeCharacter(text);
        if (!character) return std::nullopt;
        if (*character < firstOfFour) {
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
            character = firstOfFour + ((character & 0x3FFu) << 10) + (units[++i] & 0x3FFu);
        }
        appendUtf8(text, character);
    }
    return text;
}

}  // namespace vrx::codec
