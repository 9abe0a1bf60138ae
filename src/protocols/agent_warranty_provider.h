// The source of an agent's coverage records, downloads and follow-ups. Any thread may call it. The serial number is
// null for a device that has none.
#pragma once

#include <cstdint>
#include <optional>
#include <string>

#include "vrx/platform/date.h"
#include "vrx/platform/task.h"
#include "vrx/platform/value.h"
#include "vrx/protocols/forward.h"

namespace vrx {

class VRXAgentWarrantyProvider {
public:
    using SerialNumber = std::optional<std::string>;
    // Called once, with success and the record; success is true exactly when there is a record.
    using DownloadCompletion = platform::OnceCallback<bool, std::shared_ptr<VRXWarranty>>;

    virtual ~VRXAgentWarrantyProvider() = default;

    // Both return the device infos whose follow-up is shown afterwards. "Followup" is spelled so on purpose.
    virtual DeviceInfoList refreshFollowupWithDeviceInfos(const DeviceInfoList& deviceInfos) = 0;
    virtual DeviceInfoList refreshFollowupWithDeviceInfo(const std::shared_ptr<VRXDeviceInfo>& deviceInfo) = 0;
    virtual void dismissFollowUpForSerialNumber(const std::string& serialNumber) = 0;

    virtual void downloadWarrantyForSerialNumber(const SerialNumber& serialNumber,
                                                 DownloadCompletion completionHandler) = 0;

    virtual std::shared_ptr<VRXWarranty> cachedWarrantyForSerialNumber(const SerialNumber& serialNumber) = 0;
    // The metadata as stored, whatever its type; null when there is none.
    virtual platform::Value lastUpdatedDateForSerialNumber(const SerialNumber& serialNumber) = 0;
    virtual platform::Value cachedWarrantyVersionForSerialNumber(const SerialNumber& serialNumber) = 0;
    virtual platform::Value cachedWarrantyLocaleForSerialNumber(const SerialNumber& serialNumber) = 0;

    virtual std::shared_ptr<VRXWarranty> migrateLegacyCachedWarrantyIfNeededForSerialNumber(
        const SerialNumber& serialNumber) = 0;
    virtual void migrateLegacyFollowUpIfNeededWithDeviceInfo(const std::shared_ptr<VRXDeviceInfo>& deviceInfo) = 0;

    // How long a cached record counts as fresh.
    virtual platform::Duration cachedWarrantyValidityDuration() = 0;
    // Whether the user is signed in to the cloud account.
    virtual bool isSignedInToNimbus() = 0;

    virtual std::int32_t migrationVersion() = 0;
    virtual void setMigrationVersion(std::int32_t version) = 0;
};

}  // namespace vrx
