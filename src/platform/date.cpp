#include "vrx/platform/date.h"

#include <cmath>
#include <cstdint>

namespace vrx::platform {

std::optional<CalendarTime> calendarTime(Date date) {
    using namespace std::chrono;
    constexpr double yearOne = -62135596800.0;
    constexpr double year10000 = 253402300800.0;
    const double epoch = std::floor(epochSeconds(date));
    if (!(epoch >= yearOne && epoch < year10000)) return std::nullopt;
    const sys_seconds instant(seconds(static_cast<std::int64_t>(epoch)));
    const auto today = floor<days>(instant);
    const year_month_day calendar(today);
    const hh_mm_ss time(instant - today);
    return CalendarTime{static_cast<int>(calendar.year()),        static_cast<unsigned>(calendar.month()),
                        static_cast<unsigned>(calendar.day()),    static_cast<int>(time.hours().count()),
                        static_cast<int>(time.minutes().count()), static_cast<int>(time.seconds().count())};
}

}  // namespace vrx::platform
