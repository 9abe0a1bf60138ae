// The follow-up manager. It decides for each device whether its follow-up is posted, updated or removed, and has its
// provider do that. Made afresh for each piece of work; it runs on its caller's thread and is done when it returns. A
// failure is logged and does not stop the rest. Device infos are never null, but may lack device and record.
// A leading "_" is spelled so on purpose; "Names" in docs/architecture.md says why.
#pragma once

#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "vrx/followup/follow_up_provider.h"
#include "vrx/protocols/agent_collaborators.h"

namespace vrx {

class VRXFollowUp final : public VRXFollowUpManaging {
public:
    // Uses the platform's follow-up service.
    VRXFollowUp();
    explicit VRXFollowUp(std::shared_ptr<VRXFollowUpProvider> followUpProvider);

    const std::shared_ptr<VRXFollowUpProvider>& followUpProvider() const { return followUpProvider_; }

    // Posts the follow-ups that are due. Returns whether any was due, even if the service refused it. "DevicesInfo" is
    // spelled so on purpose.
    bool postFollowUpWithDevicesInfo(const DeviceInfoList& deviceInfos) override;
    bool _postFollowUpWithDevicesInfo(const DeviceInfoList& deviceInfos, bool repostAllowed);
    // Posts whatever the dates and dismissals say, provided that there are an offer and a serial number.
    void postFollowUpWithDeviceInfo(const std::shared_ptr<VRXDeviceInfo>& deviceInfo);

    // These return the device infos whose follow-up counts as shown afterwards: those that were updated, whether or not
    // the service accepted the update, and, if one of them was due, all that may be posted again. "Followup" is spelled
    // so on purpose.
    DeviceInfoList refreshFollowupWithDeviceInfos(const DeviceInfoList& deviceInfos) override;
    DeviceInfoList refreshFollowupWithDeviceInfo(const std::shared_ptr<VRXDeviceInfo>& deviceInfo,
                                                 bool allowForcePost) override;
    DeviceInfoList refreshFollowupWithDeviceInfos(const DeviceInfoList& deviceInfos, bool clearUntrackedDeviceFollowups,
                                                  bool allowForcePost);

    void _clearFollowUpWithDevices(const DeviceList& devices);
    // A dismissal always names a device. Without a serial number it would remove the older layout's item and have
    // nothing to remember.
    void dismissFollowUpForSerialNumber(const std::string& serialNumber) override;
    std::size_t pendingFollowUpCount() override;
    // Turns the one item of the older single-device layout into the device's own item, or removes it when the device
    // has no record. Does nothing when anything else is pending.
    void migrateLegacyFollowUpIfNeededWithDeviceInfo(const std::shared_ptr<VRXDeviceInfo>& deviceInfo) override;

    // "Identfier" is spelled so on purpose.
    static std::string uniqueIdentfierForSerialNumber(const std::optional<std::string>& serialNumber);
    // Fills the item from the record, which the device info must have.
    void _setupFollowUpItem(platform::FollowUpItem& item, const std::shared_ptr<VRXDeviceInfo>& deviceInfo) const;

private:
    void update(platform::FollowUpItem& item, const std::shared_ptr<VRXDeviceInfo>& deviceInfo);
    bool repost(const DeviceInfoList& deviceInfos);

    const std::shared_ptr<VRXFollowUpProvider> followUpProvider_;
};

}  // namespace vrx
