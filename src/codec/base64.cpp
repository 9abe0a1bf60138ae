#include "vrx/codec/base64.h"

#include <algorithm>
#include <cstdint>
#include <iterator>

namespace vrx::codec {

namespace {
constexpr std::string_view alphabet = "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789+/";
}

std::string base64FromData(const platform::Data& data) {
    std::string text;
    text.reserve((data.size() + 2) / 3 * 4);
    for (std::size_t i = 0; i < data.size(); i += 3) {
        auto byte = [&](std::size_t k) -> std::uint32_t { return k < data.size() ? data[k] : 0u; };
        const std::uint32_t group = byte(i) << 16 | byte(i + 1) << 8 | byte(i + 2);
        text += alphabet[group >> 18];
        text += alphabet[group >> 12 & 63];
        text += i + 1 < data.size() ? alphabet[group >> 6 & 63] : '=';
        text += i + 2 < data.size() ? alphabet[group & 63] : '=';
    }
    return text;
}

std::optional<platform::Data> dataFromBase64(std::string_view text) {
    std::string characters;
    characters.reserve(text.size());
    std::ranges::copy_if(text, std::back_inserter(characters),
                         [](char c) { return c != ' ' && c != '\t' && c != '\n' && c != '\r'; });
    if (characters.size() % 4 != 0) return std::nullopt;
    std::size_t padding = 0;
    for (; padding < 2 && characters.ends_with('='); ++padding) characters.pop_back();

    platform::Data data;
    data.reserve(characters.size() / 4 * 3 + 2);
    std::uint32_t bits = 0;
    int waiting = 0;  // bits that do not fill a byte yet
    for (char c : characters) {
        const std::size_t digit = alphabet.find(c);
        if (digit == alphabet.npos) return std::nullopt;
        bits = bits << 6 | static_cast<std::uint32_t>(digit);
        waiting += 6;
        if (waiting < 8) continue;
        waiting -= 8;
        data.push_back(static_cast<std::uint8_t>(bits >> waiting));
    }
    return data;
}

}  // namespace vrx::codec
