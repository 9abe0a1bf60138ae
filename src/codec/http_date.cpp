#include "vrx/codec/http_date.h"

#include <algorithm>
#include <array>
#include <charconv>
#include <chrono>

#include "vrx/codec/line_text.h"

namespace vrx::codec {

using namespace std::chrono;

namespace {

constexpr std::size_t mostWords = 6;

// The words of a date; more than a date has are counted, but not kept.
struct Words {
    std::array<std::string_view, mostWords> all;
    std::size_t count = 0;
};

Words wordsOf(std::string_view text) {
    constexpr std::string_view separators = " ,-";
    Words words;
    for (std::size_t begin = 0; (begin = text.find_first_not_of(separators, begin)) != text.npos; ++words.count) {
        const std::size_t end = std::min(text.find_first_of(separators, begin), text.size());
        if (words.count < mostWords) words.all[words.count] = text.substr(begin, end - begin);
        begin = end;
    }
    return words;
}

// Digits only, so few that they fit; -1 for anything else, which is no number of a date.
int numberIn(std::string_view text) {
    int number = 0;
    const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), number);
    const bool isWhole = error == std::errc() && end == text.data() + text.size();
    return isWhole && text.size() <= 4 && text.front() != '-' ? number : -1;
}

unsigned monthIn(std::string_view text) {
    constexpr std::string_view names = "JanFebMarAprMayJunJulAugSepOctNovDec";
    const std::size_t at = text.size() == 3 ? names.find(text) : names.npos;
    return at == names.npos || at % 3 != 0 ? 0 : static_cast<unsigned>(at / 3 + 1);
}

// Two digits mean a year from 1970 to 2069.
int yearIn(std::string_view text) {
    const int number = numberIn(text);
    if (text.size() == 2 && number >= 0) return number + (number < 70 ? 2000 : 1900);
    return text.size() == 4 ? number : -1;
}

// 08:49:37; null for no time of a day.
std::optional<seconds> timeIn(std::string_view text) {
    if (text.size() != 8 || text[2] != ':' || text[5] != ':') return std::nullopt;
    const int hour = numberIn(text.substr(0, 2)), minute = numberIn(text.substr(3, 2)),
              second = numberIn(text.substr(6, 2));
    if (hour < 0 || hour > 23 || minute < 0 || minute > 59 || second < 0 || second > 60) return std::nullopt;
    return hours(hour) + minutes(minute) + seconds(second);
}

std::optional<platform::Date> dateOf(std::string_view dayText, std::string_view monthText, std::string_view yearText,
                                     std::string_view timeText) {
    const int dayNumber = numberIn(dayText), yearNumber = yearIn(yearText);
    if (dayNumber < 1 || yearNumber < 1) return std::nullopt;
    const year_month_day calendar(year(yearNumber), month(monthIn(monthText)), day(static_cast<unsigned>(dayNumber)));
    const std::optional<seconds> time = timeIn(timeText);
    if (!calendar.ok() || !time) return std::nullopt;
    return platform::Date(sys_seconds(sys_days(calendar)) + *time);
}

}  // namespace

// The weekday stands first in each, and says nothing that the rest does not say.
std::optional<platform::Date> parseHttpDate(std::string_view text) {
    const auto& [word, count] = wordsOf(trimmed(text));
    // Sun, 06 Nov 1994 08:49:37 GMT, or Sunday, 06-Nov-94 08:49:37 GMT
    if (count == 6 && word[5] == "GMT") return dateOf(word[1], word[2], word[3], word[4]);
    // Sun Nov  6 08:49:37 1994
    if (count == 5) return dateOf(word[2], word[1], word[4], word[3]);
    return std::nullopt;
}

}  // namespace vrx::codec
