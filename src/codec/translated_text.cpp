#include "vrx/codec/translated_text.h"

#include <algorithm>
#include <cctype>

#include "vrx/platform/utf8.h"

namespace vrx::codec {

namespace {

constexpr std::size_t mostTextBytes = 1024;

struct LanguageParts {
    std::string language, script, region;  // in small letters; empty where there is none

    std::string joined(bool withScript, bool withRegion) const {
        std::string result = language;
        if (withScript && !script.empty()) result += "_" + script;
        if (withRegion && !region.empty()) result += "_" + region;
        return result;
    }
};

// A script may stand where POSIX has its modifier. Null when there is a part that means something else.
std::optional<LanguageParts> partsOf(std::string_view name) {
    LanguageParts parts;
    const auto take = [&](std::string part) {
        if (part == "latin") part = "latn";
        if (part == "cyrillic") part = "cyrl";
        if (parts.language.empty()) return !(parts.language = std::move(part)).empty();
        std::string& place = part.size() == 4 ? parts.script : parts.region;
        if (part.size() < 2 || part.size() > 4 || !place.empty()) return false;
        place = std::move(part);
        return true;
    };
    const std::size_t encoding = std::min(name.find('.'), name.size());
    std::string rest(name.substr(0, encoding));
    if (const std::size_t modifier = name.find('@', encoding); modifier != name.npos) rest += name.substr(modifier);
    std::ranges::transform(rest, rest.begin(), [](unsigned char c) { return static_cast<char>(std::tolower(c)); });
    for (std::size_t end; (end = rest.find_first_of("_-@")) != rest.npos; rest.erase(0, end + 1))
        if (!take(rest.substr(0, end))) return std::nullopt;
    return take(rest) ? std::optional(parts) : std::nullopt;
}

// Chinese is named by its script or by a region that stands for it.
void completeChinese(LanguageParts& parts) {
    if (parts.language != "zh") return;
    const bool isTraditional = parts.region == "tw" || parts.region == "hk" || parts.region == "mo";
    if (parts.script.empty() && !parts.region.empty()) parts.script = isTraditional ? "hant" : "hans";
    if (parts.region.empty() && !parts.script.empty()) parts.region = parts.script == "hant" ? "tw" : "cn";
}

// Null when it is no text for people.
std::optional<std::string> lineOf(std::string_view text) {
    if (text.size() > 16 * mostTextBytes || !platform::isUtf8(text)) return std::nullopt;
    std::string line;
    for (const char c : text) {
        const bool isBlank = c == ' ' || c == '\t' || c == '\n' || c == '\r';
        if (!isBlank && (static_cast<unsigned char>(c) < ' ' || c == '\x7f')) return std::nullopt;
        if (!isBlank)
            line += c;
        else if (!line.empty() && line.back() != ' ')
            line += ' ';
    }
    if (line.ends_with(' ')) line.pop_back();
    return line.empty() || line.size() > mostTextBytes ? std::nullopt : std::optional(std::move(line));
}

}  // namespace

TranslatedText::TranslatedText(std::string_view language) {
    if (auto parts = partsOf(language)) {
        completeChinese(*parts);
        wanted_ = {parts->joined(true, true), parts->joined(true, false), parts->joined(false, true), parts->language};
    }
    wanted_.emplace_back();  // the text that is not translated
    rank_ = wanted_.size();
}

void TranslatedText::offer(std::string_view language, std::string_view text) {
    const auto parts = partsOf(language);
    if (!parts && !language.empty()) return;
    const auto place = std::ranges::find(wanted_, parts ? parts->joined(true, true) : std::string());
    const auto rank = static_cast<std::size_t>(place - wanted_.begin());
    if (rank >= rank_) return;
    if (std::optional<std::string> line = lineOf(text)) {
        nearest_ = std::move(line);
        rank_ = rank;
    }
}

}  // namespace vrx::codec
