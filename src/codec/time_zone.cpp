#include "codec/time_zone.h"

#include <unicode/ucal.h>

#include <cmath>

namespace vrx::codec {

std::optional<std::chrono::seconds> timeZoneOffset(const std::string& zone, platform::Date at) {
    const std::u16string name(zone.begin(), zone.end());  // names are ASCII; another character matches none
    const auto length = static_cast<std::int32_t>(name.size());
    UErrorCode status = U_ZERO_ERROR;

    // An unknown zone would silently be taken for GMT, but has no canonical name.
    char16_t canonical[128];
    UBool isSystem = false;
    ucal_getCanonicalTimeZoneID(name.data(), length, canonical, 128, &isSystem, &status);
    if (U_FAILURE(status)) return std::nullopt;

    UCalendar* calendar = ucal_open(name.data(), length, "en", UCAL_GREGORIAN, &status);
    ucal_setMillis(calendar, std::floor(platform::epochSeconds(at) * 1000), &status);
    const std::int32_t milliseconds =
        ucal_get(calendar, UCAL_ZONE_OFFSET, &status) + ucal_get(calendar, UCAL_DST_OFFSET, &status);
    ucal_close(calendar);
    if (U_FAILURE(status)) return std::nullopt;
    return std::chrono::seconds(milliseconds / 1000);
}

}  // namespace vrx::codec
