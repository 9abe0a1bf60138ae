// The system log. Every line has a fixed format string, by which people find it:
//     log(Level::Default, "%{private}@ : warranty download attempt (%d/%d)", serialNumber, 0, 2);
// Placeholders: %@ any describable value, %{private}@ the same, redacted by the sink, %s an operation's full name, %d a
// flag or a 32-bit integer, %ld a signed and %lu an unsigned 64-bit integer, %.02f seconds. A format that does not fit
// its arguments does not compile. An argument's description is brief: what is beyond limits::logArgumentBytes is left
// out. Any thread may log.
#pragma once

#include <algorithm>
#include <optional>
#include <string>
#include <string_view>
#include <type_traits>
#include <vector>

#include "vrx/platform/limits.h"
#include "vrx/platform/text.h"

namespace vrx::platform {

enum class Level { Debug, Default, Error };

struct LogArgument {
    std::string text;
    std::optional<std::string> redacted{};  // what a log shows instead; null: the text itself
};

inline constexpr std::string_view redactedMark = "<private>";

// A text for "%@" that holds secrets, and what a log shows in its place.
struct RedactableText {
    std::string text;
    std::string redacted;

    std::string description() const { return text; }
};

// One line: the format names the line, the arguments fill it.
struct LogEntry {
    Level level;
    std::string_view format;
    std::vector<LogArgument> arguments;
    const char* file;
    int line;

    // The line with its arguments. Private arguments are redacted unless they are to be revealed.
    std::string message(bool revealPrivate = false) const;
};

// Where the lines go, under the subsystem and category of the agent.
class SystemLog {
public:
    virtual ~SystemLog() = default;
    // Asked before a line is composed.
    virtual bool isOn(Level level) const = 0;
    virtual void write(const LogEntry& entry) = 0;
};

inline constexpr std::string_view logSubsystemName = ".Vireo";  // after the vendor prefix
inline constexpr std::string_view logCategory = "core";

// The process-wide log: the current platform's.
SystemLog& systemLog();

namespace log_detail {

// Not constexpr: reaching one of them at compile time is an error, and its name is the message.
void format_has_fewer_placeholders_than_arguments();
void format_has_more_placeholders_than_arguments();
void format_has_an_unknown_placeholder();
void argument_does_not_fit_its_placeholder();

enum class Kind { Object, Private, Name, Int, Long, UnsignedLong, Seconds, End };

struct Placeholder {
    Kind kind;
    std::size_t begin;  // position of the "%"
    std::size_t end;    // position behind the placeholder
};

// The next placeholder at or behind a position.
constexpr Placeholder nextPlaceholder(std::string_view format, std::size_t from) {
    constexpr struct {
        std::string_view text;
        Kind kind;
    } known[] = {{"%@", Kind::Object}, {"%{private}@", Kind::Private}, {"%s", Kind::Name},      {"%d", Kind::Int},
                 {"%ld", Kind::Long},  {"%lu", Kind::UnsignedLong},    {"%.02f", Kind::Seconds}};
    std::size_t begin = format.find('%', from);
    if (begin == std::string_view::npos) return {Kind::End, format.size(), format.size()};
    for (const auto& [text, kind] : known)
        if (format.substr(begin, text.size()) == text) return {kind, begin, begin + text.size()};
    format_has_an_unknown_placeholder();
    return {Kind::End, format.size(), format.size()};
}

template <class T>
constexpr bool fits(Kind kind) {
    constexpr bool integral = std::is_integral_v<T>;
    switch (kind) {
        case Kind::Object:
        case Kind::Private: return Describable<T> && !std::is_arithmetic_v<T>;
        case Kind::Name: return std::is_convertible_v<T, std::string_view>;
        case Kind::Int: return std::is_same_v<T, bool> || (integral && std::is_signed_v<T> && sizeof(T) <= 4);
        case Kind::Long: return integral && std::is_signed_v<T>;
        case Kind::UnsignedLong: return integral && std::is_unsigned_v<T>;
        case Kind::Seconds: return std::is_same_v<T, Duration>;
        case Kind::End: return false;
    }
    return false;
}

template <class... Args>
constexpr void checkFormat(std::string_view format) {
    std::size_t position = 0;
    [[maybe_unused]] auto check = [&]<class T>(std::type_identity<T>) {
        Placeholder placeholder = nextPlaceholder(format, position);
        if (placeholder.kind == Kind::End) format_has_fewer_placeholders_than_arguments();
        if (!fits<T>(placeholder.kind)) argument_does_not_fit_its_placeholder();
        position = placeholder.end;
    };
    (check(std::type_identity<Args>()), ...);
    if (nextPlaceholder(format, position).kind != Kind::End) format_has_more_placeholders_than_arguments();
}

std::string roundedSeconds(Duration duration);

// What is put together from brief parts can be too long again. The words about what is left out may stay.
inline std::string cutToLimit(std::string text) {
    constexpr std::size_t leftOut = 64;
    return text.size() - std::min(text.size(), leftOut) > BriefDescriptions::limit() ? describe(text) : text;
}

template <class T>
std::string argumentText(const T& value) {
    if constexpr (std::is_integral_v<T>)
        return std::to_string(value);
    else if constexpr (std::is_same_v<T, Duration>)
        return roundedSeconds(value);
    else
        return cutToLimit(describe(value));
}

template <class T>
LogArgument argument(Kind kind, const T& value) {
    if (kind == Kind::Private) return {argumentText(value), std::string(redactedMark)};
    if constexpr (std::is_same_v<T, RedactableText>) return {describe(value.text), describe(value.redacted)};
    return {argumentText(value)};
}

}  // namespace log_detail

template <class... Args>
struct LogFormat {
    consteval LogFormat(const char* text, const char* file = __builtin_FILE(), int line = __builtin_LINE())
        : text(text), file(file), line(line) {
        log_detail::checkFormat<Args...>(text);
    }
    std::string_view text;
    const char* file;
    int line;
};

template <class... Args>
void log(Level level, std::type_identity_t<LogFormat<std::decay_t<Args>...>> format, const Args&... args) {
    SystemLog& sink = systemLog();
    if (!sink.isOn(level)) return;
    LogEntry entry{level, format.text, {}, format.file, format.line};
    entry.arguments.reserve(sizeof...(args));
    const BriefDescriptions brief(limits::logArgumentBytes);
    [[maybe_unused]] std::size_t position = 0;
    [[maybe_unused]] auto add = [&](const auto& value) {
        log_detail::Placeholder placeholder = log_detail::nextPlaceholder(format.text, position);
        position = placeholder.end;
        entry.arguments.push_back(log_detail::argument(placeholder.kind, value));
    };
    (add(args), ...);
    sink.write(entry);
}

}  // namespace vrx::platform
