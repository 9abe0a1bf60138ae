#include "vrx/scheduling/date_rules.h"

#include "vrx/devices/records/device_info.h"

namespace vrx {

using platform::Date;
using platform::Duration;

namespace {

Duration fromNow(const std::optional<Date>& date, Date now) {
    return date ? *date - now : Duration(0);
}

}  // namespace

bool isEarlier(const std::optional<Date>& date, const std::optional<Date>& other, Date now) {
    return fromNow(date, now) < fromNow(other, now);
}

bool isFuture(const std::optional<Date>& date, Date now) {
    return fromNow(date, now) > Duration(0);
}

bool isPast(const std::optional<Date>& date, Date now) {
    return fromNow(date, now) < Duration(0);
}

std::optional<Date> firstDisplayDate(const VRXDeviceInfo& info, const VRXWarranty& warranty, Duration outreachDelay,
                                     Date now) {
    auto device = info.device();
    std::optional<Date> base = device ? device->activationDate() : std::nullopt;
    if (base) *base += outreachDelay;
    std::optional<Date> named = warranty.qxOfferFollowupDisplayDate();
    return named && !isEarlier(named, base, now) ? named : base;  // of two equal dates, the named one
}

}  // namespace vrx
