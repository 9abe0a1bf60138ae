// Points in time and durations: seconds in double precision, never a bare double.
#pragma once

#include <chrono>
#include <optional>

#include "vrx/platform/api.h"

namespace vrx::platform {

using Duration = std::chrono::duration<double>;
using Date = std::chrono::sys_time<Duration>;

// The date that lies the given number of seconds after 1970-01-01 00:00:00 UTC.
constexpr Date dateFromEpoch(double seconds) {
    return Date(Duration(seconds));
}

constexpr double epochSeconds(Date date) {
    return date.time_since_epoch().count();
}

// A date in the UTC calendar, rounded down to a second.
struct CalendarTime {
    int year;
    unsigned month, day;
    int hour, minute, second;
};
// Null outside the years 1 to 9999; such dates are valid all the same.
VRX_CLIENT_API std::optional<CalendarTime> calendarTime(Date date);

}  // namespace vrx::platform
