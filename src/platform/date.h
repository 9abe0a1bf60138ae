// Points in time and durations: seconds in double precision, never a bare double.
#pragma once

#include <chrono>

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

}  // namespace vrx::platform
