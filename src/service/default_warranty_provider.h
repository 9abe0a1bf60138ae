// The warranty provider of an agent that serves an application. It reads the cache and the defaults afresh and makes a
// new worker for each piece of work, so that the providers of several agents never disagree. Any thread may call it.
// A leading "_" is spelled so on purpose; "Names" in docs/architecture.md says why.
#pragma once

#include <string>

#include "vrx/protocols/agent_collaborators.h"
#include "vrx/protocols/agent_warranty_provider.h"

namespace vrx {

class VRXAgentDefaultWarrantyProvider final : public VRXAgentWarrantyProvider {
public:
    // Works on behalf of the application with that bundle identifier.
    VRXAgentDefaultWarrantyProvider(std::string callingProcessBundleID, AgentCollaborators collaborators);

    DeviceInfoList refreshFollowupWithDeviceInfos(const DeviceInfoList& deviceInfos) override;
    DeviceInfoList refreshFollowupWithDeviceInfo(const std::shared_ptr<VRXDeviceInfo>& deviceInfo) override;
    void dismissFollowUpForSerialNumber(const std::string& serialNumber) override;
    void downloadWarrantyForSerialNumber(const SerialNumber& serialNumber,
                                         DownloadCompletion completionHandler) override;
    std::shared_ptr<VRXWarranty> cachedWarrantyForSerialNumber(const SerialNumber& serialNumber) override;
    platform::Value lastUpdatedDateForSerialNumber(const SerialNumber& serialNumber) override;
    platform::Value cachedWarrantyVersionForSerialNumber(const SerialNumber& serialNumber) override;
    platform::Value cachedWarrantyLocaleForSerialNumber(const SerialNumber& serialNumber) override;
    std::shared_ptr<VRXWarranty> migrateLegacyCachedWarrantyIfNeededForSerialNumber(
        const SerialNumber& serialNumber) override;
    void migrateLegacyFollowUpIfNeededWithDeviceInfo(const std::shared_ptr<VRXDeviceInfo>& deviceInfo) override;
    platform::Duration cachedWarrantyValidityDuration() override;
    bool isSignedInToNimbus() override;
    std::int32_t migrationVersion() override;
    void setMigrationVersion(std::int32_t version) override;

private:
    std::shared_ptr<VRXFollowUpManaging> makeFollowUp() const;

    const std::string _callingProcessBundleID;
    const AgentCollaborators collaborators_;
};

}  // namespace vrx
