// What the rules for the next post and the next refresh share. They compare dates by their signed distance from now; an
// absent date counts as now. Pure functions.
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

// The first day on which the device's offer may be shown: the end of the outreach delay after its activation, or the
// day that its record names, whichever is later. Without an activation date the delay counts as ending now: a day that
// the record names for later holds, and otherwise the result is null. Beside it stands dueDateInRecord() in
// followup/follow_up_rules.h, which knows no outreach delay and counts back from the offer's end where no day is named.
std::optional<platform::Date> firstDisplayDate(const VRXDeviceInfo& info, const VRXWarranty& warranty,
                                               platform::Duration outreachDelay, platform::Date now);

}  // namespace vrx
