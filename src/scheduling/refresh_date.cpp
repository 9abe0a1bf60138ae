#include "vrx/scheduling/refresh_date.h"

#include "vrx/devices/records/device_info.h"
#include "vrx/platform/defaults_store.h"
#include "vrx/platform/platform.h"
#include "vrx/platform/settings_keys.h"
#include "vrx/scheduling/date_rules.h"

namespace vrx {

using platform::Date;
using platform::Duration;

namespace {

// The next date after an offer of the record is taken into account.
std::optional<Date> withOffer(const std::optional<Date>& next, const VRXDeviceInfo& info, const VRXWarranty& warranty,
                              const RefreshDateSettings& settings, Date now) {
    std::optional<Date> until = warranty.qxOfferEligibleUntil();
    // An offer without a known end counts no days and is not shown, so it sets no date.
    if (!until) return next;
    std::uint32_t daysEligible = VRXWarranty::daysEligible(until, settings.oneDay, now);
    // An offer that has ended but is still asked for is due at its end, whatever the other devices say: its follow-up
    // has to go.
    if (daysEligible == 0) return until;

    std::optional<Date> result = next;
    Duration span = settings.oneDay * (daysEligible - 1.0);
    if (span > Duration(0)) {
        std::optional<Date> firstDisplay = firstDisplayDate(info, warranty, settings.outreachDelay, now);
        Date countdown = *until - span;  // within a day from now, when the number of days left drops by one
        if (isEarlier(countdown, result, now) || (!result && isPast(firstDisplay, now))) result = countdown;
        bool isFirst = !result || isEarlier(firstDisplay, result, now);
        if (firstDisplay && isFuture(firstDisplay, now) && isFirst) result = firstDisplay;
    }
    if (isEarlier(until, result, now)) result = until;
    return result;
}

}  // namespace

RefreshDateSettings RefreshDateSettings::read() {
    const platform::DefaultsStore& defaults = platform::Platform::current().defaultsStore();
    return {Duration(defaults.number(platform::settings::oneDayInterval)),
            Duration(defaults.number(platform::settings::postUpgradeOutreachDelay))};
}

std::optional<Date> nextRefreshDate(const DeviceInfoList& deviceInfos, bool isInitialCall,
                                    const RefreshDateSettings& settings, Date now) {
    std::optional<Date> next;
    if (!isInitialCall) next = now + settings.oneDay;
    for (const auto& info : deviceInfos) {
        auto warranty = info->warranty();
        if (warranty && warranty->qxOfferDisplay()) next = withOffer(next, *info, *warranty, settings, now);
        if (isPast(next, now)) break;
    }
    return next;
}

}  // namespace vrx
