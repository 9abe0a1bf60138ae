#include "platform/text.h"

#include <charconv>
#include <cmath>
#include <cstdio>

#include "platform/error.h"

namespace vrx::platform {

std::string describe(std::int64_t number) {
    return std::to_string(number);
}

std::string describe(double number) {
    char buffer[32];
    auto [end, error] = std::to_chars(buffer, buffer + sizeof buffer, number);
    return std::string(buffer, end);
}

std::string describe(Date date) {
    // Beyond these the calendar of std::chrono ends; they are dates all the same.
    constexpr double yearOne = -62135596800.0;
    constexpr double year10000 = 253402300800.0;
    double seconds = epochSeconds(date);
    if (!(seconds >= yearOne && seconds < year10000)) return describe(seconds) + " s from 1970-01-01 00:00:00 +0000";
    auto whole = std::chrono::sys_seconds(std::chrono::seconds(static_cast<std::int64_t>(std::floor(seconds))));
    auto day = std::chrono::floor<std::chrono::days>(whole);
    std::chrono::year_month_day calendar(day);
    std::chrono::hh_mm_ss time(whole - day);
    char buffer[64];
    std::snprintf(buffer, sizeof buffer, "%04d-%02u-%02u %02d:%02d:%02d +0000", static_cast<int>(calendar.year()),
                  static_cast<unsigned>(calendar.month()), static_cast<unsigned>(calendar.day()),
                  static_cast<int>(time.hours().count()), static_cast<int>(time.minutes().count()),
                  static_cast<int>(time.seconds().count()));
    return buffer;
}

std::string filled(std::string_view format, std::initializer_list<std::string_view> texts) {
    std::string result;
    for (std::string_view text : texts) {
        std::size_t placeholder = format.find("%@");
        if (placeholder == std::string_view::npos) break;
        result.append(format.substr(0, placeholder)).append(text);
        format.remove_prefix(placeholder + 2);
    }
    return result.append(format);
}

std::string Error::description() const {
    return text + " (" + domain + " " + std::to_string(code) + ")";
}

}  // namespace vrx::platform
