#include "vrx/codec/key_file.h"

#include <algorithm>
#include <optional>

namespace vrx::codec {

namespace {

std::string_view withoutBlanks(std::string_view text) {
    constexpr std::string_view blanks = " \t\r";
    const std::size_t begin = text.find_first_not_of(blanks);
    if (begin == text.npos) return {};
    return text.substr(begin, text.find_last_not_of(blanks) + 1 - begin);
}

// Null when it is no line of a group.
std::optional<std::string_view> groupOf(std::string_view line) {
    if (line.size() < 3 || !line.starts_with('[') || !line.ends_with(']')) return std::nullopt;
    const std::string_view name = line.substr(1, line.size() - 2);
    return name.find_first_of("[]") == name.npos ? std::optional(name) : std::nullopt;
}

}  // namespace

bool readKeyFile(std::string_view document, std::string_view group,
                 const std::function<void(std::string_view key, std::string_view value)>& entry) {
    std::optional<std::string_view> current;
    while (!document.empty()) {
        const std::size_t end = std::min(document.find('\n'), document.size());
        const std::string_view line = withoutBlanks(document.substr(0, end));
        document.remove_prefix(std::min(end + 1, document.size()));
        if (line.empty() || line.starts_with('#')) continue;
        if (line.starts_with('[')) {
            if (!(current = groupOf(line))) return false;
            continue;
        }
        const std::size_t equals = line.find('=');
        if (!current || equals == line.npos || equals == 0) return false;
        if (*current == group) entry(withoutBlanks(line.substr(0, equals)), withoutBlanks(line.substr(equals + 1)));
    }
    return true;
}

}  // namespace vrx::codec
