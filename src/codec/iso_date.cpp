#include "vrx/codec/iso_date.h"

#include <algorithm>
#include <chrono>
#include <cstdio>

namespace vrx::codec {

using namespace std::chrono;

std::optional<std::string> isoTextFromDate(platform::Date date) {
    const std::optional<platform::CalendarTime> time = platform::calendarTime(date);
    if (!time) return std::nullopt;
    char text[64];
    std::snprintf(text, sizeof text, "%04d-%02u-%02uT%02d:%02d:%02dZ", time->year, time->month, time->day, time->hour,
                  time->minute, time->second);
    return text;
}

std::optional<platform::Date> dateFromIsoText(std::string_view text) {
    constexpr std::string_view form = "0000-00-00T00:00:00Z";
    auto fits = [](char c, char inForm) { return inForm == '0' ? c >= '0' && c <= '9' : c == inForm; };
    if (!std::ranges::equal(text, form, fits)) return std::nullopt;
    auto number = [&](std::size_t begin, std::size_t length) {
        int result = 0;
        for (char c : text.substr(begin, length)) result = result * 10 + (c - '0');
        return result;
    };
    const year_month_day calendar(year(number(0, 4)), month(static_cast<unsigned>(number(5, 2))),
                                  day(static_cast<unsigned>(number(8, 2))));
    const int hour = number(11, 2), minute = number(14, 2), second = number(17, 2);
    if (!calendar.ok() || number(0, 4) == 0 || hour > 23 || minute > 59 || second > 59) return std::nullopt;
    return platform::Date(sys_seconds(sys_days(calendar)) + hours(hour) + minutes(minute) + seconds(second));
}

}  // namespace vrx::codec
