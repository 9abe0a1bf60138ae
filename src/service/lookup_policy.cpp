// The lookup policy of VRXAgent: whether the cached coverage record, a downloaded one or none answers a request.

#include <utility>

#include "vrx/coverage/cache_metadata.h"
#include "vrx/coverage/records/warranty.h"
#include "vrx/platform/clock.h"
#include "vrx/platform/locale.h"
#include "vrx/platform/log.h"
#include "vrx/platform/platform.h"
#include "vrx/service/agent.h"
#include "vrx/service/cached_record.h"

namespace vrx {

using platform::Date;
using platform::Duration;
using platform::Level;
using platform::Platform;
using platform::Value;

std::optional<CachedRecordFlaw> flawOfCachedRecord(VRXAgentWarrantyProvider& provider,
                                                   const std::optional<std::string>& serialNumber) {
    Value version = provider.cachedWarrantyVersionForSerialNumber(serialNumber);
    if (version != Value(currentCacheVersion)) {
        log(Level::Default, "cached warranty is of outdated version '%@', current version is '%@', consider it invalid",
            version, currentCacheVersion);
        return CachedRecordFlaw::OutdatedVersion;
    }
    Value locale = provider.cachedWarrantyLocaleForSerialNumber(serialNumber);
    std::string currentLocale = Platform::current().locale().preferredLocaleIdentifier();
    if (locale != Value(currentLocale)) {
        log(Level::Default, "cached warranty is for locale '%@', system is now in '%@', consider it invalid", locale,
            currentLocale);
        return CachedRecordFlaw::OtherLocale;
    }
    if (!provider.isSignedInToNimbus()) {
        log(Level::Default, "user is signed out of Nimbus, cached warranty not allowed");
        return CachedRecordFlaw::SignedOut;
    }
    // The text is spelled so on purpose.
    log(Level::Default, "cached warranty is for locale ('%@') and version ('%@') match system, consider it valid",
        locale, version);
    return std::nullopt;
}

namespace {

using SerialNumber = VRXAgent::SerialNumber;

// Whether a valid cached record is still fresh. A record with a date in the future, from a clock that was set back, is
// fresh.
bool isFresh(VRXAgentWarrantyProvider& provider, const SerialNumber& serialNumber) {
    std::optional<Date> lastUpdated = provider.lastUpdatedDateForSerialNumber(serialNumber).asDate();
    if (!lastUpdated) {
        log(Level::Default, "warranty validity expired, refresh it");
        return false;
    }
    Duration remaining = provider.cachedWarrantyValidityDuration() + (*lastUpdated - Platform::current().clock().now());
    if (remaining > Duration::zero()) {
        log(Level::Default, "warranty valid for %.02f seconds", remaining);
        return true;
    }
    // Subtracted from zero rather than negated, so that 0 has no sign.
    log(Level::Default, "warranty validity expired %.02f seconds ago, refresh it", Duration::zero() - remaining);
    return false;
}

bool shouldDownload(VRXWarrantyLookupPolicy policy, bool cachedIsValid, VRXAgentWarrantyProvider& provider,
                    const SerialNumber& serialNumber) {
    if (policy == VRXWarrantyLookupPolicyRefresh) return true;
    if (policy != VRXWarrantyLookupPolicyDefault) return false;
    if (!cachedIsValid) {
        log(Level::Default, "Default policy query: cached warranty is invalid, refresh it");
        return true;
    }
    log(Level::Default, "Default policy query: cached warranty is valid, examine expiration date");
    return !isFresh(provider, serialNumber);
}

}  // namespace

void VRXAgent::getWarrantyUsingPolicy(VRXWarrantyLookupPolicy policy, const SerialNumber& serialNumber,
                                      WarrantyReply reply) {
    log(Level::Default, "getting warranty using policy %@: %lu", serialNumber, policy);
    auto provider = warrantyProvider();

    // The cached record, unless it has a flaw.
    std::shared_ptr<VRXWarranty> cached = provider->cachedWarrantyForSerialNumber(serialNumber);
    if (!cached) {
        log(Level::Default, "no cached warranty : %@", serialNumber);
    } else {
        log(Level::Default, "Has cached warranty : %@", serialNumber);
        if (flawOfCachedRecord(*provider, serialNumber)) cached = nullptr;
    }

    const bool isDownloading = shouldDownload(policy, cached != nullptr, *provider, serialNumber);
    log(Level::Default, "%s: shouldDownloadWarranty: %d", "-[VRXAgent getWarrantyUsingPolicy:serialNumber:withReply:]",
        isDownloading);
    if (policy == VRXWarrantyLookupPolicyRefresh) cached = nullptr;  // a refresh never answers with an old record

    auto answer = [serialNumber, cached = std::move(cached),
                   reply = std::move(reply)](std::shared_ptr<VRXWarranty> downloaded) mutable {
        log(Level::Default, "getWarrantyUsingPolicy completionBlock %{private}@ : %d", serialNumber,
            downloaded != nullptr);
        reply(downloaded ? std::move(downloaded) : std::move(cached));
    };
    if (!isDownloading) return answer(nullptr);
    provider->downloadWarrantyForSerialNumber(
        serialNumber,
        [self = shared_from_this(), answer = std::move(answer)](
            bool /*success*/, std::shared_ptr<VRXWarranty> warranty) mutable { answer(std::move(warranty)); });
}

}  // namespace vrx
