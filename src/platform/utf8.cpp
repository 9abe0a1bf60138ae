#include "vrx/platform/utf8.h"

namespace vrx::platform {

namespace {

constexpr char32_t firstOfTwoBytes = 0x80, firstOfThree = 0x800, firstOfFour = 0x10000, last = 0x10FFFF;

bool isSurrogate(char32_t character) {
    return character >= 0xD800 && character <= 0xDFFF;
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
    // A character that would fit into fewer bytes is an overlong form, which is not valid.
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

bool isUtf8(std::string_view text) {
    while (!text.empty())
        if (!takeCharacter(text)) return false;
    return true;
}

}  // namespace vrx::platform
