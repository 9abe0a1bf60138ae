#include "vrx/host/profile/clock.h"

#include <ctime>

#include "vrx/codec/time_zone.h"

namespace vrx::host {

platform::Date Clock::now() const {
    return std::chrono::system_clock::now();
}

std::chrono::seconds Clock::timeZoneOffset() const {
    if (const std::shared_ptr<const ProfileContent> content = profile_.content(); content->timeZone)
        if (std::optional<std::chrono::seconds> offset = codec::timeZoneOffset(*content->timeZone, now()))
            return *offset;
    // localtime_r alone does not notice a change of the system's zone.
    tzset();
    const std::time_t present = std::time(nullptr);
    std::tm fields{};
    localtime_r(&present, &fields);
    return std::chrono::seconds(fields.tm_gmtoff);
}

}  // namespace vrx::host
