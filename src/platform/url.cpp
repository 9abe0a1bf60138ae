#include "vrx/platform/url.h"

#include <algorithm>

namespace vrx::platform {

namespace {

bool isLetter(char c) {
    return (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z');
}
bool isDigit(char c) {
    return c >= '0' && c <= '9';
}

int hexDigit(char c) {
    if (isDigit(c)) return c - '0';
    if (c >= 'a' && c <= 'f') return c - 'a' + 10;
    if (c >= 'A' && c <= 'F') return c - 'A' + 10;
    return -1;
}

// Escapes all but letters, digits and the characters that are kept.
std::string escaped(std::string_view text, std::string_view kept) {
    constexpr char digits[] = "0123456789ABCDEF";
    std::string result;
    for (char c : text) {
        if (isLetter(c) || isDigit(c) || kept.find(c) != std::string_view::npos) {
            result += c;
        } else {
            auto byte = static_cast<unsigned char>(c);
            result += '%';
            result += digits[byte >> 4];
            result += digits[byte & 15];
        }
    }
    return result;
}

// Null when an escape is broken.
std::optional<std::string> unescaped(std::string_view text) {
    std::string result;
    for (std::size_t i = 0; i < text.size(); ++i) {
        if (text[i] != '%') {
            result += text[i];
            continue;
        }
        bool whole = i + 2 < text.size();
        int high = whole ? hexDigit(text[i + 1]) : -1;
        int low = whole ? hexDigit(text[i + 2]) : -1;
        if (high < 0 || low < 0) return std::nullopt;
        result += static_cast<char>(high * 16 + low);
        i += 2;
    }
    return result;
}

constexpr std::string_view keptInComponent = "-._~!$&'()*+,;=:@";

}  // namespace

std::optional<Url> Url::parse(std::string_view text) {
    std::size_t colon = text.find(':');
    if (colon == std::string_view::npos || colon == 0 || !isLetter(text[0])) return std::nullopt;
    auto inScheme = [](char c) { return isLetter(c) || isDigit(c) || c == '+' || c == '-' || c == '.'; };
    if (!std::ranges::all_of(text.substr(0, colon), inScheme)) return std::nullopt;
    auto isControl = [](char c) { return static_cast<unsigned char>(c) < 0x20 || c == 0x7f; };
    if (std::ranges::any_of(text, isControl)) return std::nullopt;
    return Url(std::string(text));
}

Url Url::forFile(std::string_view path) {
    return Url("file://" + escaped(path, std::string(keptInComponent) + "/"));
}

bool Url::isFile() const {
    constexpr std::string_view scheme = "file:";
    return text_.size() > scheme.size() && std::equal(scheme.begin(), scheme.end(), text_.begin(), [](char a, char b) {
               return a == (b >= 'A' && b <= 'Z' ? static_cast<char>(b - 'A' + 'a') : b);
           });
}

std::optional<std::string> Url::filePath() const {
    if (!isFile()) return std::nullopt;
    std::string_view rest(text_);
    rest.remove_prefix(5);
    if (rest.starts_with("//")) {
        rest.remove_prefix(2);
        std::string_view host = rest.substr(0, rest.find('/'));
        if (!host.empty() && host != "localhost") return std::nullopt;
        rest.remove_prefix(host.size());
    }
    rest = rest.substr(0, rest.find_first_of("?#"));
    if (!rest.starts_with('/')) return std::nullopt;
    std::optional<std::string> path = unescaped(rest);
    if (!path || path->find('\0') != std::string::npos) return std::nullopt;
    if (std::ranges::count(*path, '/') != std::ranges::count(rest, '/')) return std::nullopt;
    return path;
}

std::pair<std::size_t, std::size_t> Url::extensionRange() const {
    std::size_t end = std::min(text_.find_first_of("?#"), text_.size());
    std::size_t slash = text_.rfind('/', end);
    std::size_t component = slash == std::string::npos ? 0 : slash + 1;
    std::size_t dot = end > 0 ? text_.rfind('.', end - 1) : std::string::npos;
    // A dot at the beginning of a component marks a hidden file, not an extension.
    if (dot == std::string::npos || dot <= component) dot = end;
    return {dot, end};
}

std::string Url::pathExtension() const {
    auto [dot, end] = extensionRange();
    if (dot == end) return {};
    std::string extension = text_.substr(dot + 1, end - dot - 1);
    return unescaped(extension).value_or(extension);
}

Url Url::withPathExtension(std::string_view extension) const {
    auto [dot, end] = extensionRange();
    return Url(text_.substr(0, dot) + "." + escaped(extension, keptInComponent) + text_.substr(end));
}

}  // namespace vrx::platform
