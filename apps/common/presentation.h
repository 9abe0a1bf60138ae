// How text for people is shown: tables that fit the terminal, dates in local time, colours. What is piped is plain, and
// has its full width. One thread.
#pragma once

#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

#include "vrx/platform/date.h"

namespace vrx::apps {

struct Presentation {
    bool isAtTerminal = false;  // standard output
    bool isWide = false;        // --wide: nothing is shortened
    bool isUtc = false;         // --utc
    bool hasColours = false;
};

// The program's. CommandLine fills it in before the verb runs.
Presentation& presentation();
// The same with what standard output and $NO_COLOR say.
void lookAtTerminal();

// How many columns of a terminal a text takes: two for wide characters, none for combining ones.
std::size_t displayWidth(std::string_view text);
// At most so many columns, with "…" in place of what was left out. Of an identifier or a path, the end
// stays, which tells it from others.
std::string shortened(const std::string& text, std::size_t columns);

// Left-aligned columns, a line for each row. The first row is the heading, if there is one. Cells are made printable.
// At a terminal the widest columns are shortened until a line fits, or the last one is broken into lines.
enum class Fit : std::uint8_t { Shorten, BreakLast };
std::string table(const std::vector<std::vector<std::string>>& rows, Fit fit = Fit::Shorten);

// "2031-03-14 01:00" in local time, or "2031-03-14 00:00 UTC".
std::string dateText(platform::Date date);
// "2031-03-14", for tables.
std::string dayText(platform::Date date);
// "in 2 days", "3 hours ago", "now".
std::string timeLeftText(platform::Date date, platform::Date now);
// Both.
std::string dateAndTimeLeft(platform::Date date);

enum class Colour : std::uint8_t { Bold = 1, Red = 31, Green = 32, Yellow = 33 };
// The text itself where there are no colours.
std::string coloured(const std::string& text, Colour colour);

}  // namespace vrx::apps
