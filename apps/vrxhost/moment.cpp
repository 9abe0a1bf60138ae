#include "vrxhost/moment.h"

#include <charconv>
#include <cmath>
#include <ctime>

#include "common/presentation.h"
#include "vrx/codec/iso_date.h"

namespace vrx::apps {

using platform::Date;
using platform::Duration;

namespace {

std::optional<Duration> distanceFrom(std::string_view text) {
    constexpr double most = 1e5 * 86400;
    if (text.size() < 2 || text.front() != '+') return std::nullopt;
    double number = 0;
    const char* const last = text.data() + text.size() - 1;
    const auto [end, error] = std::from_chars(text.data() + 1, last, number);
    if (error != std::errc() || end != last || !(number >= 0)) return std::nullopt;
    const double unit = *last == 'd' ? 86400 : *last == 'h' ? 3600 : *last == 'm' ? 60 : *last == 's' ? 1 : 0;
    if (unit == 0 || number * unit > most) return std::nullopt;
    return Duration(number * unit);
}

// The calendar's moment of that name where the user is. One that the clock leaps over counts as the one after it.
Date local(Date asUtc) {
    if (presentation().isUtc) return asUtc;
    const auto calendar = platform::calendarTime(asUtc);
    std::tm parts{};
    parts.tm_year = calendar->year - 1900;
    parts.tm_mon = static_cast<int>(calendar->month) - 1;
    parts.tm_mday = static_cast<int>(calendar->day);
    parts.tm_hour = calendar->hour;
    parts.tm_min = calendar->minute;
    parts.tm_isdst = -1;
    return platform::dateFromEpoch(static_cast<double>(std::mktime(&parts)));
}

}  // namespace

std::optional<Date> momentFrom(const std::string& text, Date now) {
    constexpr std::size_t dayEnd = 10, minuteEnd = 16;
    if (const auto distance = distanceFrom(text)) return now + *distance;
    if (const auto date = codec::dateFromIsoText(text)) return date;
    std::string whole = text + (text.size() == dayEnd ? "T00:00:00Z" : ":00Z");
    if (text.size() == minuteEnd && (whole[dayEnd] == ' ' || whole[dayEnd] == 'T'))
        whole[dayEnd] = 'T';
    else if (text.size() != dayEnd)
        return std::nullopt;
    const auto date = codec::dateFromIsoText(whole);
    return date ? std::optional(local(*date)) : std::nullopt;
}

std::string momentMistake(const std::string& text) {
    if (momentFrom(text, Date())) return "";
    return "'" + text + "' is no moment such as 2027-03-01, '2027-03-01 10:14', 2027-03-01T10:14:00Z or +30d";
}

}  // namespace vrx::apps
