// What the rules for the next post and the next refresh share. Dates are compared by their signed distance from now; a
// date that is absent counts as now. Pure functions.
#pragma once

#include <optional>

#include "vrx/platform/date.h"

namespace vrx {

class VRXDeviceInfo;
class VRXWarranty;

bool isEarlier(const std::optional<platform::Date>& date, const std::optional<platform::Date>& other,
               platform::Date now);
bool isFuture(const std::optional<platform::Date>& date, platform::Date now);
bool isPast(const std::optional<platform::Date>& date, platform::Date now);

// From when on the device's offer may be shown: the outreach delay after its activation, or the day that its record
// names, whichever is later. A device without activation date counts as if that delay ended now: what its record names
// for later holds, and else there is no date.
std::optional<platform::Date> firstDisplayDate(const VRXDeviceInfo& info, const VRXWarranty& warranty,
                                               platform::Duration outreachDelay, platform::Date now);

}  // namespace vrx
