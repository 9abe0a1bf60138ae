#include "vrx/followup/follow_up_content.h"

#include <utility>

#include "vrx/devices/records/device_info.h"
#include "vrx/platform/clock.h"
#include "vrx/platform/sha256_hash.h"
#include "vrx/platform/vendor.h"

namespace vrx {

using platform::Clock;
using platform::Date;
using platform::Dictionary;
using platform::Duration;
using platform::FollowUpItem;
using platform::Value;

namespace {

constexpr std::string_view serialNumberKey = "FollowupSerialNumber";
constexpr Duration beforeEligibilityEnds{0.001};

// The server's texts are as it sent them: only a string is a text, and anything else counts as missing.
std::optional<std::string> textOf(const Value& value) {
    const std::string* text = value.asString();
    return text ? std::optional(*text) : std::nullopt;
}

bool shouldShowRowBadge(const VRXWarranty& record, const Clock& clock) {
    if (!record.qxOfferSettingsRowBadge()) return false;
    const std::optional<Date> until = record.qxOfferEligibleUntil();
    return until && *until - record.qxOfferBadgeDurationBeforeEndDate() < clock.now() && *until > clock.now();
}

// Every device whose item is filled has a serial number; without one, the item would belong to no device.
Dictionary userInfoFor(const std::optional<std::string>& serialNumber, const VRXWarranty& record) {
    Dictionary userInfo;
    if (serialNumber) userInfo.emplace(serialNumberKey, *serialNumber);
    userInfo.emplace(platform::DaysLeftRoundsUpKey, true);
    if (auto text = textOf(record.qxLocalizedOfferSingularDesc()))
        userInfo.emplace(platform::OneDayLeftTextKey, *std::move(text));
    if (auto format = textOf(record.qxLocalizedOfferPluralDescFormat()))
        userInfo.emplace(platform::DaysLeftFormatKey, *std::move(format));
    return userInfo;
}

std::optional<std::string> targetBundleIdentifier(VRXDeviceType type, std::string settingsAppBundleIdentifier) {
    switch (type) {
        case VRXDeviceTypeDefault: return settingsAppBundleIdentifier;
        case VRXDeviceTypeWatch: return platform::vendorIdentifier(".Tether");
        default: return std::nullopt;
    }
}

}  // namespace

std::string followUpClientIdentifier() {
    return platform::vendorIdentifier(".Vireo");
}

std::string followUpUniqueIdentifier(const std::optional<std::string>& serialNumber) {
    const std::string client = followUpClientIdentifier();
    return serialNumber ? client + "." + platform::sha256Hash(*serialNumber) : client;
}

const std::string* serialNumberOfItem(const FollowUpItem& item) {
    const auto entry = item.userInfo.find(serialNumberKey);
    return entry == item.userInfo.end() ? nullptr : entry->second.asString();
}

FollowUpItem newFollowUpItem(const VRXDevice& device, std::string settingsAppBundleIdentifier) {
    return {
        .uniqueIdentifier = followUpUniqueIdentifier(device.serialNumber()),
        .groupIdentifier = platform::vendorIdentifier(".followup.group.vrx"),
        .targetBundleIdentifier = targetBundleIdentifier(device.deviceType(), std::move(settingsAppBundleIdentifier)),
        .extensionIdentifier = platform::vendorIdentifier(".Vireo.Extension"),
        .displayStyle = platform::follow_up_style::notification};
}

FilledFollowUpItem filledFollowUpItem(FollowUpItem item, const VRXDeviceInfo& info, const Clock& clock) {
    const auto device = info.device();
    const auto record = info.warranty();
    item.title = textOf(record->qxLocalizedOfferLabel());
    item.informativeFooterText = textOf(record->qxLocalizedOfferDesc());
    item.expirationDate = record->qxOfferEligibleUntil();
    if (item.expirationDate) *item.expirationDate -= beforeEligibilityEnds;
    const bool showsRowBadge = shouldShowRowBadge(*record, clock);
    item.displayStyle |=
        showsRowBadge ? platform::follow_up_style::withRowBadge : platform::follow_up_style::withoutRowBadge;
    item.userInfo = userInfoFor(device ? device->serialNumber() : std::nullopt, *record);
    item.actions = {{.label = textOf(record->qxLocalizedOfferCTA())}};
    return {std::move(item), showsRowBadge};
}

}  // namespace vrx
