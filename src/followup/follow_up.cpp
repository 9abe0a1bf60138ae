#include "vrx/followup/follow_up.h"

#include <map>
#include <mutex>
#include <set>
#include <utility>

#include "vrx/devices/records/device_info.h"
#include "vrx/followup/default_follow_up_provider.h"
#include "vrx/followup/follow_up_content.h"
#include "vrx/followup/follow_up_rules.h"
#include "vrx/followup/serial_number_hashes.h"
#include "vrx/followup/turn_lock.h"
#include "vrx/platform/clock.h"
#include "vrx/platform/defaults_store.h"
#include "vrx/platform/log.h"
#include "vrx/platform/platform.h"
#include "vrx/platform/settings_keys.h"
#include "vrx/platform/sha256_hash.h"

namespace vrx {

using platform::Duration;
using platform::FollowUpItem;
using platform::Level;
using platform::MaybeError;
using platform::Platform;

namespace {

using SharedDevice = std::shared_ptr<VRXDevice>;
using SharedDeviceInfo = std::shared_ptr<VRXDeviceInfo>;

std::optional<std::string> serialNumberOf(const VRXDeviceInfo& info) {
    const SharedDevice device = info.device();
    return device ? device->serialNumber() : std::nullopt;
}

std::string outcomeText(bool success, const MaybeError& error) {
    return success ? "success" : platform::describe(error);
}

// The log texts of this file are spelled so on purpose: "followup" beside "follow-up", and spaces too many.
void logDecision(const PostDecision& decision, const SharedDevice& device) {
    if (decision.dueDate && decision.dueDate->isInitial)
        log(Level::Default, "Using initial postdate as it is later than FollowupDisplay Date");
    switch (decision.reason) {
        case PostReason::NoRecord:
            return log(Level::Default, "No warranty downloaded for device. Don't post a followup for %{private}@",
                       device);
        case PostReason::NoOffer:
            return log(Level::Default, "Device NOT eligible. Don't post a followup for %{private}@", device);
        case PostReason::NoLongerEligible:
            return log(Level::Default, "Device no longer eligible. Don't post a followup for %{private}@", device);
        case PostReason::Dismissed:
            return log(Level::Default, "Followup already dismissed for %{private}@, leaving unposted", device);
        case PostReason::Due: return log(Level::Default, "Device eligible. Post new  followup for %{private}@", device);
        case PostReason::DueLater:
            return log(Level::Default,
                       "Device eligible with future post date. Cannot post followup for %{private}@ on: %@", device,
                       decision.dueDate->date);
    }
}

void logDecision(RefreshReason reason, const SharedDevice& device) {
    switch (reason) {
        case RefreshReason::NoRecord:
            return log(Level::Default, "No warranty downloaded for device. Remove the followup for %{private}@",
                       device);
        case RefreshReason::NoOffer:
            return log(Level::Default, "Device NOT eligible. Remove the followup for %{private}@", device);
        case RefreshReason::NoLongerEligible:
            return log(Level::Default, "Device no longer eligible. Remove the followup for %{private}@", device);
        case RefreshReason::Pending:
            return log(Level::Default, "Device eligible. Update the followup for %{private}@", device);
        case RefreshReason::RepostAllowed:
            return log(Level::Default, "Device eligible for re-post. Re-post the followup for %{private}@", device);
        case RefreshReason::NotPending:
            return log(Level::Default, "Followup already dismissed for %{private}@, leaving unposted", device);
    }
}

// The first pending item of each device. Items that name no device are left alone.
using ItemsBySerialNumber = std::map<std::string, FollowUpItem*>;

ItemsBySerialNumber itemsBySerialNumber(std::vector<FollowUpItem>& pending) {
    ItemsBySerialNumber items;
    for (FollowUpItem& item : pending)
        if (const std::string* serialNumber = serialNumberOfItem(item)) items.try_emplace(*serialNumber, &item);
    return items;
}

struct ItemUpdate {
    SharedDeviceInfo deviceInfo;
    FollowUpItem* item;
};

struct RefreshPlan {
    DeviceList removals;
    std::vector<ItemUpdate> updates;
    DeviceInfoList reposts;
};

RefreshPlan planRefresh(const DeviceInfoList& deviceInfos, const ItemsBySerialNumber& items, bool allowForcePost) {
    RefreshPlan plan;
    for (const SharedDeviceInfo& info : deviceInfos) {
        const std::optional<std::string> serialNumber = serialNumberOf(*info);
        const auto item = serialNumber ? items.find(*serialNumber) : items.end();
        const RefreshReason reason =
            decideRefresh(*info, {.isPending = item != items.end(), .isForcePostAllowed = allowForcePost},
                          Platform::current().clock());
        logDecision(reason, info->device());
        switch (actionFor(reason)) {
            case RefreshAction::Remove:
                // A device without a serial number never had an item. The identifier that it would have belongs to the
                // item of the older layout, which a refresh leaves alone.
                if (serialNumber) plan.removals.push_back(info->device());
                break;
            case RefreshAction::Update: plan.updates.push_back({info, item->second}); break;
            case RefreshAction::Repost: plan.reposts.push_back(info); break;
            case RefreshAction::LeaveAlone: break;
        }
    }
    return plan;
}

// Devices that have a pending item but are not in the list. Only their serial number is known.
DeviceList untrackedDevices(const ItemsBySerialNumber& items, const DeviceInfoList& deviceInfos) {
    std::set<std::string> tracked;
    for (const SharedDeviceInfo& info : deviceInfos)
        if (auto serialNumber = serialNumberOf(*info)) tracked.insert(*std::move(serialNumber));
    DeviceList untracked;
    for (const auto& [serialNumber, item] : items) {
        if (tracked.contains(serialNumber)) continue;
        untracked.push_back(VRXDevice::deviceWithName(serialNumber, serialNumber, std::nullopt, VRXDeviceTypeDefault));
        log(Level::Default, "No longer tracking device %{private}@, clearing", untracked.back());
    }
    return untracked;
}

// Returns whatever the service listed, even with an error.
std::vector<FollowUpItem> pendingItems(VRXFollowUpProvider& provider) {
    MaybeError error;
    std::vector<FollowUpItem> items = provider.pendingFollowUpItems(&error);
    if (error) log(Level::Error, "Error loading pending follow-ups: %@", *error);
    return items;
}

// One piece of work at a time in this process. Otherwise a refresh could post an item again that was dismissed after it
// had been listed. Held over deciding and carrying out, and over clearing and remembering; taken again by work within
// work. It cannot hold back another process.
[[nodiscard]] std::unique_lock<TurnLock> onePieceOfWork() {
    static TurnLock lock;
    return std::unique_lock(lock);
}

}  // namespace

VRXFollowUp::VRXFollowUp() : VRXFollowUp(std::make_shared<VRXDefaultFolllowUpProvider>()) {}

VRXFollowUp::VRXFollowUp(std::shared_ptr<VRXFollowUpProvider> followUpProvider)
    : followUpProvider_(std::move(followUpProvider)) {}

bool VRXFollowUp::postFollowUpWithDevicesInfo(const DeviceInfoList& deviceInfos) {
    constexpr bool repostAllowed = false;
    return _postFollowUpWithDevicesInfo(deviceInfos, repostAllowed);
}

bool VRXFollowUp::_postFollowUpWithDevicesInfo(const DeviceInfoList& deviceInfos, bool repostAllowed) {
    const auto lock = onePieceOfWork();
    const std::set<std::string> dismissed = serialNumberHashes(dismissedSerialNumberHashesKey);
    const Duration outreachDelay(
        Platform::current().defaultsStore().number(platform::settings::postUpgradeOutreachDelay));
    // First the decisions for all devices, by one reading of dismissals and delay, then the posts.
    DeviceInfoList due;
    for (const SharedDeviceInfo& info : deviceInfos) {
        const std::optional<std::string> serialNumber = serialNumberOf(*info);
        const PostDecision decision =
            decidePost(*info,
                       {.isDismissed = serialNumber && dismissed.contains(platform::sha256Hash(*serialNumber)),
                        .isRepostAllowed = repostAllowed,
                        .outreachDelay = outreachDelay},
                       Platform::current().clock());
        logDecision(decision, info->device());
        if (decision.reason == PostReason::Due) due.push_back(info);
    }
    for (const SharedDeviceInfo& info : due) postFollowUpWithDeviceInfo(info);
    return !due.empty();
}

void VRXFollowUp::postFollowUpWithDeviceInfo(const SharedDeviceInfo& deviceInfo) {
    const auto lock = onePieceOfWork();
    const auto record = deviceInfo->warranty();
    const SharedDevice device = deviceInfo->device();
    const std::optional<std::string> serialNumber = device ? device->serialNumber() : std::nullopt;
    if (!record || !record->qxOfferDisplay() || !serialNumber)
        return log(Level::Error, "Failed to post follow-up:%@%@", record ? "" : "<Missing warranty>",
                   serialNumber ? "" : "<Missing serial number>");

    FollowUpItem item =
        newFollowUpItem(*device, Platform::current().followUpControllers().settingsAppBundleIdentifier());
    _setupFollowUpItem(item, deviceInfo);
    MaybeError error;
    const bool success = followUpProvider_->postFollowUpItem(item, &error);
    log(Level::Default, "Posted follow-up: serialNumber:%@ -> %@", *serialNumber, outcomeText(success, error));
    if (success) appendMissingSerialNumberHash(postedSerialNumberHashesKey, *serialNumber);
}

DeviceInfoList VRXFollowUp::refreshFollowupWithDeviceInfos(const DeviceInfoList& deviceInfos) {
    constexpr bool clearUntrackedDeviceFollowups = true;
    constexpr bool allowForcePost = false;
    return refreshFollowupWithDeviceInfos(deviceInfos, clearUntrackedDeviceFollowups, allowForcePost);
}

DeviceInfoList VRXFollowUp::refreshFollowupWithDeviceInfo(const SharedDeviceInfo& deviceInfo, bool allowForcePost) {
    constexpr bool clearUntrackedDeviceFollowups = false;
    return refreshFollowupWithDeviceInfos({deviceInfo}, clearUntrackedDeviceFollowups, allowForcePost);
}

DeviceInfoList VRXFollowUp::refreshFollowupWithDeviceInfos(const DeviceInfoList& deviceInfos,
                                                           bool clearUntrackedDeviceFollowups, bool allowForcePost) {
    const auto lock = onePieceOfWork();
    std::vector<FollowUpItem> pending = pendingItems(*followUpProvider_);
    const ItemsBySerialNumber items = itemsBySerialNumber(pending);
    RefreshPlan plan = planRefresh(deviceInfos, items, allowForcePost);
    if (clearUntrackedDeviceFollowups) {
        const DeviceList untracked = untrackedDevices(items, deviceInfos);
        plan.removals.insert(plan.removals.end(), untracked.begin(), untracked.end());
    }

    if (!plan.removals.empty()) _clearFollowUpWithDevices(plan.removals);
    DeviceInfoList shown;
    for (const auto& [deviceInfo, item] : plan.updates) {
        update(*item, deviceInfo);
        shown.push_back(deviceInfo);
    }
    if (!plan.reposts.empty() && repost(plan.reposts))
        shown.insert(shown.end(), plan.reposts.begin(), plan.reposts.end());
    return shown;
}

void VRXFollowUp::update(FollowUpItem& item, const SharedDeviceInfo& deviceInfo) {
    _setupFollowUpItem(item, deviceInfo);
    MaybeError error;
    const bool success = followUpProvider_->postFollowUpItem(item, &error);
    log(Level::Default, "Updated follow-up: %@", outcomeText(success, error));
}

bool VRXFollowUp::repost(const DeviceInfoList& deviceInfos) {
    constexpr bool repostAllowed = true;
    const bool wasAnyDue = _postFollowUpWithDevicesInfo(deviceInfos, repostAllowed);
    log(Level::Default, "Reposted follow-up: %@", wasAnyDue ? "success" : "NO");
    return wasAnyDue;
}

void VRXFollowUp::_clearFollowUpWithDevices(const DeviceList& devices) {
    std::vector<std::string> identifiers;
    identifiers.reserve(devices.size());
    for (const SharedDevice& device : devices)
        identifiers.push_back(uniqueIdentfierForSerialNumber(device->serialNumber()));
    MaybeError error;
    const bool success = followUpProvider_->clearPendingFollowUpItemsWithUniqueIdentifiers(identifiers, &error);
    log(Level::Default, "Cleared follow-up: %@", outcomeText(success, error));
}

void VRXFollowUp::dismissFollowUpForSerialNumber(const std::string& serialNumber) {
    const auto lock = onePieceOfWork();
    MaybeError error;
    const bool success = followUpProvider_->clearPendingFollowUpItemsWithUniqueIdentifiers(
        {uniqueIdentfierForSerialNumber(serialNumber)}, &error);
    log(Level::Default, "Dismissed follow-up: %@", outcomeText(success, error));
    if (success) appendSerialNumberHash(dismissedSerialNumberHashesKey, serialNumber);
}

std::size_t VRXFollowUp::pendingFollowUpCount() {
    return pendingItems(*followUpProvider_).size();
}

void VRXFollowUp::migrateLegacyFollowUpIfNeededWithDeviceInfo(const SharedDeviceInfo& deviceInfo) {
    const auto lock = onePieceOfWork();
    const std::string legacyIdentifier = uniqueIdentfierForSerialNumber(std::nullopt);
    std::vector<FollowUpItem> pending = pendingItems(*followUpProvider_);
    if (pending.size() != 1 || pending.front().uniqueIdentifier != legacyIdentifier) return;

    if (deviceInfo->warranty()) {
        log(Level::Default, "Migrating legacy followup..");
        FollowUpItem& item = pending.front();
        item.uniqueIdentifier = uniqueIdentfierForSerialNumber(serialNumberOf(*deviceInfo));
        _setupFollowUpItem(item, deviceInfo);
        MaybeError error;
        followUpProvider_->postFollowUpItem(item, &error);
        if (error) log(Level::Error, "Error posting migrated follow-up: %@", *error);
    } else {
        log(Level::Default, "Clearing legacy followup, no legacy warranty was found..");
    }
    // The old item goes last, so that at every moment one of the two is there.
    MaybeError error;
    followUpProvider_->clearPendingFollowUpItemsWithUniqueIdentifiers({legacyIdentifier}, &error);
    if (error) log(Level::Error, "Error clearing legacy follow-up: %@", *error);
}

std::string VRXFollowUp::uniqueIdentfierForSerialNumber(const std::optional<std::string>& serialNumber) {
    return followUpUniqueIdentifier(serialNumber);
}

void VRXFollowUp::_setupFollowUpItem(FollowUpItem& item, const SharedDeviceInfo& deviceInfo) const {
    constexpr const char* operation = "-[VRXFollowUp _setupFollowUpItem:withDeviceInfo:]";
    log(Level::Default, "%s: %{private}@", operation, deviceInfo);
    auto [filled, showsRowBadge] = filledFollowUpItem(std::move(item), *deviceInfo, Platform::current().clock());
    log(Level::Default, "%s: shouldShowRowBadge: %d", operation, showsRowBadge);
    if (!filled.userInfo.contains(platform::OneDayLeftTextKey))
        log(Level::Error, "Missing qxLocalizedOfferSingularDesc value");
    if (!filled.userInfo.contains(platform::DaysLeftFormatKey))
        log(Level::Error, "Missing qxLocalizedOfferPluralDescFormat value");
    item = std::move(filled);
}

}  // namespace vrx
