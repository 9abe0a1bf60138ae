#include "vrx/host/base/firmware_text.h"

#include <algorithm>

#include "vrx/host/base/text.h"

namespace vrx::host {

namespace {

// Compared without regard to capitals.
bool isFiller(std::string_view text) {
    constexpr std::string_view fillers[] = {"none",
                                            "n/a",
                                            "unknown",
                                            "invalid",
                                            "not specified",
                                            "not applicable",
                                            "not available",
                                            "default string",
                                            "to be filled by o.e.m.",
                                            "system serial number",
                                            "system product name",
                                            "123456789",
                                            "0123456789"};
    std::string lower(text);
    for (char& c : lower)
        if (c >= 'A' && c <= 'Z') c = static_cast<char>(c - 'A' + 'a');
    return lower.find_first_not_of("0x.-* ") == lower.npos || std::ranges::find(fillers, lower) != std::end(fillers);
}

}  // namespace

std::optional<std::string> meaningfulFirmwareText(std::string_view text) {
    text = trimmed(text.substr(0, text.find('\0')));
    if (!isOneLine(text) || isFiller(text)) return std::nullopt;
    return std::string(text);
}

}  // namespace vrx::host
