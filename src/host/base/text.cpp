#include "vrx/host/base/text.h"

#include <algorithm>

namespace vrx::host {

namespace {

// ASCII letters and digits, and the marks.
bool consistsOf(std::string_view text, std::string_view marks) {
    return std::ranges::all_of(text, [marks](char c) {
        return (c >= '0' && c <= '9') || (c >= 'A' && c <= 'Z') || (c >= 'a' && c <= 'z') ||
               marks.find(c) != marks.npos;
    });
}

}  // namespace

bool isHeaderName(std::string_view text) {
    return !text.empty() && consistsOf(text, "!#$%&'*+-.^_`|~");
}

bool isApplicationIdentifier(std::string_view text) {
    return !text.empty() && text.size() <= 255 && !text.starts_with('.') && consistsOf(text, ".-_");
}

}  // namespace vrx::host
