#include "vrx/service/default_warranty_provider.h"

#include <algorithm>
#include <cstdint>
#include <utility>

#include "vrx/coverage/cache_metadata.h"
#include "vrx/coverage/records/warranty.h"
#include "vrx/coverage/warranty_downloader.h"
#include "vrx/platform/account_store.h"
#include "vrx/platform/defaults_store.h"
#include "vrx/platform/log.h"
#include "vrx/platform/platform.h"
#include "vrx/platform/settings_keys.h"

namespace vrx {

using platform::Level;
using platform::Platform;
using platform::Value;

namespace {

constexpr std::string_view migrationVersionKey = "VRXMigrationVersion";

// A device without a serial number has no metadata.
Value metadata(const VRXAgentWarrantyProvider::SerialNumber& serialNumber, std::string_view key) {
    return serialNumber ? Platform::current().defaultsStore().get(cacheMetadataKey(*serialNumber, key)) : Value();
}

}  // namespace

VRXAgentDefaultWarrantyProvider::VRXAgentDefaultWarrantyProvider(std::string callingProcessBundleID,
                                                                 AgentCollaborators collaborators)
    : _callingProcessBundleID(std::move(callingProcessBundleID)), collaborators_(std::move(collaborators)) {
    log(Level::Debug, "%s: callingProcess=%@", "-[VRXAgentDefaultWarrantyProvider initWithCallingProcessBundleID:]",
        _callingProcessBundleID);
}

std::shared_ptr<VRXFollowUpManaging> VRXAgentDefaultWarrantyProvider::makeFollowUp() const {
    return collaborators_.makeFollowUp ? collaborators_.makeFollowUp() : nullptr;
}

DeviceInfoList VRXAgentDefaultWarrantyProvider::refreshFollowupWithDeviceInfos(const DeviceInfoList& deviceInfos) {
    auto followUp = makeFollowUp();
    return followUp ? followUp->refreshFollowupWithDeviceInfos(deviceInfos) : DeviceInfoList();
}

DeviceInfoList VRXAgentDefaultWarrantyProvider::refreshFollowupWithDeviceInfo(
    const std::shared_ptr<VRXDeviceInfo>& deviceInfo) {
    constexpr bool allowForcePost = false;
    auto followUp = makeFollowUp();
    return followUp ? followUp->refreshFollowupWithDeviceInfo(deviceInfo, allowForcePost) : DeviceInfoList();
}

void VRXAgentDefaultWarrantyProvider::dismissFollowUpForSerialNumber(const std::string& serialNumber) {
    if (auto followUp = makeFollowUp()) followUp->dismissFollowUpForSerialNumber(serialNumber);
}

void VRXAgentDefaultWarrantyProvider::downloadWarrantyForSerialNumber(const SerialNumber& serialNumber,
                                                                      DownloadCompletion completionHandler) {
    VRXWarrantyDownloader::initWithCallingProcessBundleID(_callingProcessBundleID)
        ->downloadWarrantyForSerialNumber(serialNumber, std::move(completionHandler));
}

std::shared_ptr<VRXWarranty> VRXAgentDefaultWarrantyProvider::cachedWarrantyForSerialNumber(
    const SerialNumber& serialNumber) {
    return VRXWarranty::cachedWarrantyForSerialNumber(serialNumber);
}

Value VRXAgentDefaultWarrantyProvider::lastUpdatedDateForSerialNumber(const SerialNumber& serialNumber) {
    return metadata(serialNumber, cachedWarrantyLastUpdatedDateKey);
}

Value VRXAgentDefaultWarrantyProvider::cachedWarrantyVersionForSerialNumber(const SerialNumber& serialNumber) {
    return metadata(serialNumber, cachedWarrantyVersionKey);
}

Value VRXAgentDefaultWarrantyProvider::cachedWarrantyLocaleForSerialNumber(const SerialNumber& serialNumber) {
    return metadata(serialNumber, cachedWarrantyLocaleKey);
}

std::shared_ptr<VRXWarranty> VRXAgentDefaultWarrantyProvider::migrateLegacyCachedWarrantyIfNeededForSerialNumber(
    const SerialNumber& serialNumber) {
    return VRXWarranty::migrateLegacyCachedWarrantyIfNeededForSerialNumber(serialNumber);
}

void VRXAgentDefaultWarrantyProvider::migrateLegacyFollowUpIfNeededWithDeviceInfo(
    const std::shared_ptr<VRXDeviceInfo>& deviceInfo) {
    if (auto followUp = makeFollowUp()) followUp->migrateLegacyFollowUpIfNeededWithDeviceInfo(deviceInfo);
}

platform::Duration VRXAgentDefaultWarrantyProvider::cachedWarrantyValidityDuration() {
    return platform::Duration(
        Platform::current().defaultsStore().number(platform::settings::cachedWarrantyValidityDuration));
}

bool VRXAgentDefaultWarrantyProvider::isSignedInToNimbus() {
    return Platform::current().accountStore().primaryCloudAccount().has_value();
}

// A stored number beyond 32 bits counts as the nearest one within them.
std::int32_t VRXAgentDefaultWarrantyProvider::migrationVersion() {
    std::int64_t version = Platform::current().defaultsStore().integer(migrationVersionKey);
    return static_cast<std::int32_t>(std::clamp<std::int64_t>(version, INT32_MIN, INT32_MAX));
}

void VRXAgentDefaultWarrantyProvider::setMigrationVersion(std::int32_t version) {
    Platform::current().defaultsStore().set(migrationVersionKey, version);
}

}  // namespace vrx
