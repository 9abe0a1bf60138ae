#include "vrx/codec/time_zone.h"

#include <unicode/ucal.h>

#include <cmath>

#include "vrx/codec/core/icu.h"

namespace vrx::codec {

namespace {

struct Functions {
    decltype(&::ucal_getCanonicalTimeZoneID) getCanonicalID = icu().function("ucal_getCanonicalTimeZoneID");
    decltype(&::ucal_open) open = icu().function("ucal_open");
    decltype(&::ucal_close) close = icu().function("ucal_close");
    decltype(&::ucal_setMillis) setMillis = icu().function("ucal_setMillis");
    decltype(&::ucal_get) get = icu().function("ucal_get");

    bool areThere() const { return getCanonicalID && open && close && setMillis && get; }
};

}  // namespace

std::optional<std::chrono::seconds> timeZoneOffset(const std::string& zone, platform::Date at) {
    static const Functions functions;
    if (!functions.areThere()) return std::nullopt;
    const std::u16string name(zone.begin(), zone.end());  // names are ASCII; any other character matches no zone
    const auto length = static_cast<std::int32_t>(name.size());
    UErrorCode status = U_ZERO_ERROR;

    // An unknown zone would silently count as GMT, but it has no canonical name.
    char16_t canonical[128];
    UBool isSystem = false;
    functions.getCanonicalID(name.data(), length, canonical, 128, &isSystem, &status);
    if (U_FAILURE(status)) return std::nullopt;

    UCalendar* calendar = functions.open(name.data(), length, "en", UCAL_GREGORIAN, &status);
    functions.setMillis(calendar, std::floor(platform::epochSeconds(at) * 1000), &status);
    const std::int32_t milliseconds =
        functions.get(calendar, UCAL_ZONE_OFFSET, &status) + functions.get(calendar, UCAL_DST_OFFSET, &status);
    functions.close(calendar);
    if (U_FAILURE(status)) return std::nullopt;
    return std::chrono::seconds(milliseconds / 1000);
}

}  // namespace vrx::codec
