#include "common/presentation.h"

#include <sys/ioctl.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <chrono>
#include <clocale>
#include <cmath>
#include <cstdlib>
#include <ctime>
#include <cwchar>
#include <optional>

#include "common/command_line.h"
#include "vrx/codec/core/unicode.h"
#include "vrx/platform/text.h"

namespace vrx::apps {

namespace {

constexpr std::size_t gap = 2, narrowestColumn = 6, narrowestText = 20;

// 0 for a character that the C library does not know how to show.
std::size_t columnsOf(char32_t character) {
    // Text is UTF-8 whatever the user's locale is.
    [[maybe_unused]] static const char* const utf8 = std::setlocale(LC_CTYPE, "C.UTF-8");
    const int columns = wcwidth(static_cast<wchar_t>(character));
    return columns < 0 ? 0 : static_cast<std::size_t>(columns);
}

// Its characters, each with the marks that combine with it.
std::vector<std::string> clusters(std::string_view text) {
    std::vector<std::string> result;
    while (!text.empty()) {
        const std::string_view before = text;
        const std::optional<char32_t> character = codec::takeCharacter(text);
        if (!character) text.remove_prefix(1);
        const std::string bytes(before.substr(0, before.size() - text.size()));
        if (character && columnsOf(*character) == 0 && !result.empty())
            result.back() += bytes;
        else
            result.push_back(bytes);
    }
    return result;
}

// 0 for no limit.
std::size_t terminalWidth() {
    if (!presentation().isAtTerminal || presentation().isWide) return 0;
    winsize size{};
    return ioctl(STDOUT_FILENO, TIOCGWINSZ, &size) == 0 ? size.ws_col : 0;
}

// Takes from the widest column until all fit, or none can give.
void fitWidths(std::vector<std::size_t>& widths, std::size_t limit) {
    std::size_t total = gap * (widths.size() - 1);
    for (const std::size_t width : widths) total += width;
    while (total > limit) {
        const auto widest = std::ranges::max_element(widths);
        if (*widest <= narrowestColumn) return;
        --*widest;
        --total;
    }
}

// At blanks, with the further lines indented.
std::string broken(const std::string& text, std::size_t columns, std::size_t indent) {
    std::string result, line;
    for (std::size_t begin = 0; begin <= text.size();) {
        const std::size_t end = std::min(text.find(' ', begin), text.size());
        const std::string word = text.substr(begin, end - begin);
        if (!line.empty() && displayWidth(line) + 1 + displayWidth(word) > columns) {
            result += line + "\n" + std::string(indent, ' ');
            line = word;
        } else {
            line += (line.empty() ? "" : " ") + word;
        }
        begin = end + 1;
    }
    return result + line;
}

std::string formatted(platform::Date date, const char* format) {
    const double seconds = std::floor(platform::epochSeconds(date));
    if (!(std::abs(seconds) < 1e11)) return platform::describe(date);  // no calendar goes that far
    const auto moment = static_cast<std::time_t>(seconds);
    std::tm parts{};
    std::array<char, 64> text{};
    if (presentation().isUtc ? gmtime_r(&moment, &parts) : localtime_r(&moment, &parts))
        return {text.data(), std::strftime(text.data(), text.size(), format, &parts)};
    return platform::describe(date);
}

std::string counted(double number, const char* unit) {
    const auto whole = static_cast<std::int64_t>(number);
    return std::to_string(whole) + " " + unit + (whole == 1 ? "" : "s");
}

}  // namespace

Presentation& presentation() {
    static Presentation presentation;
    return presentation;
}

void lookAtTerminal() {
    const char *noColour = std::getenv("NO_COLOR"), *terminal = std::getenv("TERM");
    presentation().isAtTerminal = isatty(STDOUT_FILENO) == 1;
    presentation().hasColours =
        presentation().isAtTerminal && !(noColour && *noColour) && terminal && std::string_view(terminal) != "dumb";
}

std::size_t displayWidth(std::string_view text) {
    std::size_t columns = 0;
    while (!text.empty()) {
        const std::optional<char32_t> character = codec::takeCharacter(text);
        if (!character) text.remove_prefix(1);
        columns += character ? columnsOf(*character) : 1;
    }
    return columns;
}

std::string shortened(const std::string& text, std::size_t columns) {
    if (displayWidth(text) <= columns) return text;
    std::vector<std::string> parts = clusters(text);
    const bool isEndKept = std::ranges::all_of(text, [](char c) { return c > ' ' && c < 0x7f; });
    if (isEndKept) std::ranges::reverse(parts);
    std::vector<std::string> kept;
    std::size_t used = 1;  // the ellipsis
    for (const std::string& part : parts) {
        used += displayWidth(part);
        if (used > columns) break;
        kept.push_back(part);
    }
    if (isEndKept) std::ranges::reverse(kept);
    std::string result;
    for (const std::string& part : kept) result += part;
    return isEndKept ? "…" + result : result + "…";
}

// Cells are made printable before they are measured, since escapes are longer.
std::string table(const std::vector<std::vector<std::string>>& rows, Fit fit) {
    std::vector<std::size_t> widths;
    std::vector<std::vector<std::string>> cells;
    for (const auto& row : rows) {
        widths.resize(std::max(widths.size(), row.size()));
        std::vector<std::string>& line = cells.emplace_back();
        for (std::size_t column = 0; column < row.size(); ++column) {
            line.push_back(printable(row[column]));
            widths[column] = std::max(widths[column], displayWidth(line.back()));
        }
    }
    const std::size_t limit = terminalWidth();
    std::size_t indent = gap * (widths.size() - 1) - (widths.empty() ? 0 : widths.back());
    for (const std::size_t width : widths) indent += width;
    const bool isBroken = fit == Fit::BreakLast && limit >= indent + narrowestText;
    if (limit > 0 && !widths.empty() && !isBroken) fitWidths(widths, limit);
    std::string result;
    for (const auto& line : cells) {
        std::string shown;
        for (std::size_t column = 0; column < line.size(); ++column) {
            const bool isLast = column + 1 == widths.size();
            const std::string cell = isBroken && isLast ? broken(line[column], limit - indent, indent)
                                                        : shortened(line[column], widths[column]);
            shown += cell;
            if (column + 1 < line.size()) shown.append(widths[column] - displayWidth(cell) + gap, ' ');
        }
        shown.erase(shown.find_last_not_of(' ') + 1);
        const bool isHeading = fit == Fit::Shorten && result.empty();
        result += (isHeading ? coloured(shown, Colour::Bold) : shown) + '\n';
    }
    return result;
}

std::string dateText(platform::Date date) {
    return formatted(date, presentation().isUtc ? "%F %H:%M UTC" : "%F %H:%M");
}

std::string dayText(platform::Date date) {
    return formatted(date, "%F");
}

std::string timeLeftText(platform::Date date, platform::Date now) {
    const double seconds = (date - now).count(), size = std::abs(seconds);
    constexpr double minute = 60, hour = 60 * minute, day = 24 * hour, year = 365.25 * day;
    if (!(size >= minute)) return "now";
    // Up to two of a unit, the smaller one says more.
    const std::string amount = size >= 1000 * year ? "many years"
                               : size >= 2 * year  ? counted(size / year, "year")
                               : size >= 2 * day   ? counted(size / day, "day")
                               : size >= 2 * hour  ? counted(size / hour, "hour")
                                                   : counted(size / minute, "minute");
    return seconds > 0 ? "in " + amount : amount + " ago";
}

std::string dateAndTimeLeft(platform::Date date) {
    return dateText(date) + ", " + timeLeftText(date, std::chrono::system_clock::now());
}

std::string coloured(const std::string& text, Colour colour) {
    if (!presentation().hasColours) return text;
    return "\x1b[" + std::to_string(static_cast<int>(colour)) + "m" + text + "\x1b[0m";
}

}  // namespace vrx::apps
