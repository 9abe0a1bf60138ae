#include "vrx/scheduling/post_date.h"

#include "vrx/devices/records/device_info.h"
#include "vrx/followup/serial_number_hashes.h"
#include "vrx/platform/defaults_store.h"
#include "vrx/platform/platform.h"
#include "vrx/platform/settings_keys.h"
#include "vrx/platform/sha256_hash.h"
#include "vrx/scheduling/date_rules.h"

namespace vrx {

using platform::Date;

namespace {

bool isPosted(const VRXDeviceInfo& info, const PostDateSettings& settings) {
    auto device = info.device();
    auto serialNumber = device ? device->serialNumber() : std::nullopt;
    return serialNumber && settings.postedSerialNumberHashes.contains(platform::sha256Hash(*serialNumber));
}

// The next date after an offer of the record is taken into account.
std::optional<Date> withOffer(const std::optional<Date>& next, const VRXDeviceInfo& info, const VRXWarranty& warranty,
                              const PostDateSettings& settings, Date now) {
    std::optional<Date> until = warranty.qxOfferEligibleUntil();
    std::optional<Date> result = next;
    if (isFuture(until, now)) {
        std::optional<Date> candidate = firstDisplayDate(info, warranty, settings.outreachDelay, now);
        bool isFirst = !result || isEarlier(candidate, result, now);
        if (candidate && isFuture(candidate, now) && isFirst) result = candidate;
    }
    // Without a date so far, only an end in the past is earlier. An unknown end counts as now, and so replaces a date
    // that lies ahead by null.
    if (isEarlier(until, result, now)) result = until;
    return result;
}

}  // namespace

PostDateSettings PostDateSettings::read() {
    const double delay =
        platform::Platform::current().defaultsStore().number(platform::settings::postUpgradeOutreachDelay);
    return {serialNumberHashes(postedSerialNumberHashesKey), platform::Duration(delay)};
}

std::optional<Date> nextPostDate(const DeviceInfoList& deviceInfos, const PostDateSettings& settings, Date now) {
    std::optional<Date> next;
    for (const auto& info : deviceInfos) {
        if (isPosted(*info, settings)) continue;
        auto warranty = info->warranty();
        if (warranty && warranty->qxOfferDisplay()) next = withOffer(next, *info, *warranty, settings, now);
        if (isPast(next, now)) break;
    }
    return next;
}

}  // namespace vrx
