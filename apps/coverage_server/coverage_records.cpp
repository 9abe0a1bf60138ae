#include "coverage_server/coverage_records.h"

#include <algorithm>
#include <charconv>
#include <chrono>
#include <optional>

#include "coverage_server/json.h"

namespace vrx::coverage_server {

namespace {

// Whether the serial number can only name a file in the folder.
bool isFileName(const std::string& serialNumber) {
    constexpr std::string_view others = "-_.";
    return serialNumber.size() <= 128 && !serialNumber.starts_with('.') &&
           std::ranges::all_of(serialNumber, [&](char c) {
               return (c >= '0' && c <= '9') || (c >= 'A' && c <= 'Z') || (c >= 'a' && c <= 'z') ||
                      others.find(c) != others.npos;
           });
}

double secondsIn(char unit) {
    switch (unit) {
        case 's': return 1;
        case 'm': return 60;
        case 'h': return 3600;
        case 'd': return 86400;
        default: return 0;
    }
}

std::optional<std::int64_t> timeNamed(std::string_view text, std::chrono::sys_seconds now) {
    constexpr std::string_view mark = "@now", inMilliseconds = ":ms";
    if (!text.starts_with(mark)) return std::nullopt;
    text.remove_prefix(mark.size());
    const bool isMilliseconds = text.ends_with(inMilliseconds);
    if (isMilliseconds) text.remove_suffix(inMilliseconds.size());
    double offset = 0;
    if (!text.empty()) {
        const double unit = secondsIn(text.back());
        const char sign = text.front();
        if (unit == 0 || (sign != '+' && sign != '-')) return std::nullopt;
        const char* last = text.data() + text.size() - 1;
        const auto [end, error] = std::from_chars(text.data() + 1, last, offset);
        if (error != std::errc() || end != last || !(offset >= 0 && offset < 1e6)) return std::nullopt;
        offset *= sign == '-' ? -unit : unit;
    }
    const std::int64_t seconds = now.time_since_epoch().count() + static_cast<std::int64_t>(offset);
    return isMilliseconds ? seconds * 1000 : seconds;
}

void setTimes(Json& json, std::chrono::sys_seconds now) {
    if (json.is_structured()) {
        for (Json& member : json) setTimes(member, now);
    } else if (json.is_string()) {
        if (auto time = timeNamed(json.get_ref<const std::string&>(), now)) json = *time;
    }
}

}  // namespace

std::string CoverageRecords::record(const std::string& serialNumber) const {
    if (folder_.empty()) return R"({"covered":true})";
    std::optional<Json> json;
    if (isFileName(serialNumber)) json = jsonIn(folder_ / (serialNumber + ".json"));
    if (!json) json = jsonIn(folder_ / "default.json");
    if (!json) return "";
    setTimes(*json, std::chrono::floor<std::chrono::seconds>(std::chrono::system_clock::now()));
    return dumped(*json);
}

}  // namespace vrx::coverage_server
