#include "vrx/codec/http_cache_rules.h"

#include <strings.h>

#include <algorithm>
#include <charconv>

#include "vrx/codec/http_date.h"
#include "vrx/codec/line_text.h"

namespace vrx::codec {

using platform::Date;
using platform::Duration;
using platform::HttpHeaders;

namespace {

bool isSame(std::string_view text, std::string_view name) {
    return text.size() == name.size() && strncasecmp(text.data(), name.data(), name.size()) == 0;
}

// Takes the next element of a list, up to a comma outside quotation marks. Nothing when the marks do not end.
std::optional<std::string_view> takeElement(std::string_view& list) {
    bool isQuoted = false;
    std::size_t end = 0;
    for (; end < list.size() && (isQuoted || list[end] != ','); ++end) {
        if (list[end] == '"') isQuoted = !isQuoted;
        if (list[end] == '\\' && isQuoted) ++end;
    }
    if (isQuoted) return std::nullopt;
    const std::string_view element = trimmed(list.substr(0, end));
    list.remove_prefix(std::min(end + 1, list.size()));
    return element;
}

// A number of seconds, at most 2^31.
std::optional<std::chrono::seconds> seconds(std::string_view text) {
    constexpr std::int64_t longest = std::int64_t{1} << 31;
    std::uint64_t count = 0;
    const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), count);
    if (text.empty() || end != text.data() + text.size() || error == std::errc::invalid_argument) return std::nullopt;
    if (error == std::errc::result_out_of_range || count > longest) return std::chrono::seconds(longest);
    return std::chrono::seconds(count);
}

std::string valueOf(const HttpHeaders& headers, std::string_view name) {
    const auto header = headers.find(name);
    return header == headers.end() ? "" : header->second;
}

std::optional<Date> dateIn(const HttpHeaders& headers, std::string_view name) {
    return parseHttpDate(valueOf(headers, name));
}

bool variesByMoreThanHeaders(const HttpHeaders& answer) {
    const std::string names = valueOf(answer, "Vary");
    for (std::string_view rest = names; !rest.empty();)
        if (takeElement(rest).value_or("*") == "*") return true;
    return false;
}

// Whether it is a single entity tag: a list would ask about others.
bool isEntityTag(std::string_view text) {
    if (text.starts_with("W/")) text.remove_prefix(2);
    return text.size() >= 2 && text.front() == '"' && text.find('"', 1) == text.size() - 1 && isOneLine(text);
}

}  // namespace

CacheControl parseCacheControl(std::string_view value) {
    CacheControl result;
    while (!value.empty()) {
        const std::optional<std::string_view> directive = takeElement(value);
        if (!directive) return {.isStorable = false};
        const std::size_t equals = std::min(directive->find('='), directive->size());
        const std::string_view name = trimmed(directive->substr(0, equals));
        if (isSame(name, "no-store")) result.isStorable = false;
        if (isSame(name, "no-cache")) result.mustRevalidate = true;
        if (!isSame(name, "max-age") || result.maxAge) continue;  // the first one counts
        std::string_view argument = trimmed(directive->substr(std::min(equals + 1, directive->size())));
        if (argument.size() >= 2 && argument.front() == '"' && argument.back() == '"')
            argument = argument.substr(1, argument.size() - 2);
        result.maxAge = seconds(argument).value_or(std::chrono::seconds(0));
    }
    return result;
}

bool mayStore(const HttpHeaders& answer, Date arrived) {
    if (!parseCacheControl(valueOf(answer, "Cache-Control")).isStorable || variesByMoreThanHeaders(answer))
        return false;
    return freshnessLifetime(answer, arrived) > Duration(0) || !revalidationHeaders(answer).empty();
}

Duration freshnessLifetime(const HttpHeaders& answer, Date arrived) {
    const CacheControl control = parseCacheControl(valueOf(answer, "Cache-Control"));
    if (control.mustRevalidate) return Duration(0);
    if (control.maxAge) return *control.maxAge;
    const std::optional<Date> expires = dateIn(answer, "Expires");
    if (!expires) return Duration(0);
    return std::max(*expires - dateIn(answer, "Date").value_or(arrived), Duration(0));
}

Duration ageOnArrival(const HttpHeaders& answer, Date asked, Date arrived) {
    const std::string age = valueOf(answer, "Age");
    const Duration said =
        seconds(trimmed(std::string_view(age).substr(0, age.find(',')))).value_or(std::chrono::seconds(0));
    const Duration byClock = arrived - dateIn(answer, "Date").value_or(arrived);
    return std::max(said + std::max(arrived - asked, Duration(0)), byClock);
}

HttpHeaders revalidationHeaders(const HttpHeaders& answer) {
    HttpHeaders headers;
    if (const std::string tag = valueOf(answer, "ETag"); isEntityTag(tag)) headers["If-None-Match"] = tag;
    const std::string changed = valueOf(answer, "Last-Modified");
    if (parseHttpDate(changed) && isOneLine(changed)) headers["If-Modified-Since"] = changed;
    return headers;
}

bool isConfirmed(const HttpHeaders& stored, const HttpHeaders& confirmation) {
    auto opaqueTag = [](const HttpHeaders& headers) {
        const std::string tag = valueOf(headers, "ETag");
        return tag.starts_with("W/") ? tag.substr(2) : tag;
    };
    return !confirmation.contains("ETag") || opaqueTag(confirmation) == opaqueTag(stored);
}

HttpHeaders revalidatedHeaders(HttpHeaders stored, const HttpHeaders& confirmation) {
    // They described the answer at its time.
    stored.erase("Age");
    stored.erase("Date");
    for (const auto& [name, value] : confirmation) {
        // Headers of the body or the connection are about the confirming answer, not about the stored one.
        const bool isOfBody = isSame(std::string_view(name).substr(0, 8), "Content-");
        if (isOfBody || isSame(name, "Transfer-Encoding") || isSame(name, "Connection") || isSame(name, "Keep-Alive"))
            continue;
        stored.insert_or_assign(name, value);
    }
    return stored;
}

}  // namespace vrx::codec
