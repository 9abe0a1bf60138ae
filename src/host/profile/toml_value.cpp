#include "vrx/host/profile/toml_value.h"

#include <algorithm>
#include <optional>
#include <sstream>

#include "vrx/platform/limits.h"

namespace vrx::host {

using platform::Array;
using platform::Dictionary;
using platform::Error;
using platform::Result;
using platform::Value;

namespace {

// Where the text or comment that begins at a place ends; the place itself when neither begins there.
std::size_t pastTextOrComment(std::string_view document, std::size_t begin) {
    const char quote = document[begin];
    if (quote == '#') return std::min(document.find('\n', begin), document.size());
    if (quote != '"' && quote != '\'') return begin;
    const std::string threefold(3, quote);
    const bool hasLines = document.substr(begin).starts_with(threefold);
    const std::string end = hasLines ? threefold : std::string(1, quote);
    for (std::size_t at = begin + end.size(); at < document.size(); ++at) {
        if (document[at] == '\\' && quote == '"') {
            ++at;
        } else if (document.substr(at).starts_with(end)) {
            at += end.size();
            // The last three of up to five quotes end a text of several lines.
            for (int i = 0; i < 2 && hasLines && document.substr(at).starts_with(quote); ++i) ++at;
            return at;
        } else if (document[at] == '\n' && !hasLines) {
            return at;
        }
    }
    return document.size();
}

// The first line whose keys have too many parts, or whose brackets are within too many others.
std::optional<std::ptrdiff_t> lineNestedTooDeeply(std::string_view document) {
    int dots = 0;
    int brackets = 0;
    for (std::size_t at = 0; at < document.size(); ++at) {
        if (const std::size_t past = pastTextOrComment(document, at); past != at) {
            at = past - 1;
            continue;
        }
        const char character = document[at];
        if (character == '.') ++dots;
        if (character == '[' || character == '{') ++brackets;
        if (character == ']' || character == '}') brackets = std::max(0, brackets - 1);
        if (std::string_view("[]{}=,\n").find(character) != std::string_view::npos) dots = 0;
        if (std::max(dots, brackets) > platform::limits::documentDepth)
            return 1 + std::ranges::count(document.substr(0, at), '\n');
    }
    return std::nullopt;
}

}  // namespace

Result<toml::table> parseToml(std::string_view document, const std::string& path, Error failure) {
    const auto failed = [&](std::ptrdiff_t line, std::string_view reason) {
        failure.text = path + ":" + std::to_string(line) + ": " + std::string(reason);
        return failure;
    };
    if (document.size() > mostTomlBytes)
        return failed(1, "it is longer than " + std::to_string(mostTomlBytes) + " bytes");
    if (const auto line = lineNestedTooDeeply(document)) return failed(*line, "it is nested too deeply");
    try {
        return toml::table(toml::parse(document, path));
    } catch (const toml::parse_error& error) {
        return failed(error.source().begin.line, error.description());
    }
}

Value valueOf(const toml::node& node) {
    if (const auto* flag = node.as_boolean()) return flag->get();
    if (const auto* integer = node.as_integer()) return integer->get();
    if (const auto* number = node.as_floating_point()) return number->get();
    if (const auto* text = node.as_string()) return text->get();
    if (const auto* array = node.as_array()) {
        Array elements;
        for (const toml::node& element : *array) elements.push_back(valueOf(element));
        return elements;
    }
    if (const auto* table = node.as_table()) {
        Dictionary entries;
        for (const auto& [key, entry] : *table) entries[std::string(key.str())] = valueOf(entry);
        return entries;
    }
    std::ostringstream text;
    node.visit([&](const auto& value) { text << value; });
    return text.str();
}

}  // namespace vrx::host
