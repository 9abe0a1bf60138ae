#include "vrx/platform/text.h"

#include <charconv>
#include <cstdio>

#include "vrx/platform/error.h"

namespace vrx::platform {

std::string describe(std::string_view text) {
    std::size_t end = BriefDescriptions::limit();
    if (text.size() <= end) return std::string(text);
    while (end > 0 && (static_cast<unsigned char>(text[end]) & 0xC0) == 0x80) --end;  // not within a character
    return std::string(text.substr(0, end)) + describeLeftOut(text.size() - end, "bytes");
}

std::string describeLeftOut(std::size_t count, const char* ofWhat) {
    return "... (" + std::to_string(count) + " more " + ofWhat + ")";
}

std::string describe(std::int64_t number) {
    return std::to_string(number);
}

std::string describe(double number) {
    char buffer[32];
    auto [end, error] = std::to_chars(buffer, buffer + sizeof buffer, number);
    return std::string(buffer, end);
}

std::string describe(Date date) {
    const std::optional<CalendarTime> time = calendarTime(date);
    if (!time) return describe(epochSeconds(date)) + " s from 1970-01-01 00:00:00 +0000";
    char buffer[64];
    std::snprintf(buffer, sizeof buffer, "%04d-%02u-%02u %02d:%02d:%02d +0000", time->year, time->month, time->day,
                  time->hour, time->minute, time->second);
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
