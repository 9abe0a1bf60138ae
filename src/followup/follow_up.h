// The follow-up manager: decides for each device whether its follow-up is posted, updated or removed, and has that done
// by its provider. Made afresh for each piece of work; it runs on its caller's thread and is done when it returns. What
// fails is logged, and ends nothing else. Device infos are never null, but may lack device and record.
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
    // With the platform's follow-up service.
    VRXFollowUp();
    explicit VRXFollowUp(std::shared_ptr<VRXFollowUpProvider> followUpProvider);

    const std::shared_ptr<VRXFollowUpProvider>& followUpProvider() const { return followUpProvider_; }

    // Posts what is due. Whether any was, posted or not.
    bool postFollowUpWithDevicesInfo(const DeviceInfoList& deviceInfos) override;
    bool _postFollowUpWithDevicesInfo(const DeviceInfoList& deviceInfos, bool repostAllowed);
    // Posts without looking at dates or dismissals, provided that there is an offer and a serial number.
    void postFollowUpWithDeviceInfo(const std::shared_ptr<VRXDeviceInfo>& deviceInfo);

    // These give the device infos whose follow-up counts as shown afterwards: those updated, whether or not the service
    // took the update, and, if one of them was due, all that may be posted again.
    DeviceInfoList refreshFollowupWithDeviceInfos(const DeviceInfoList& deviceInfos) override;
    DeviceInfoList refreshFollowupWithDeviceInfo(const std::shared_ptr<VRXDeviceInfo>& deviceInfo,
                                                 bool allowForcePost) override;
    DeviceInfoList refreshFollowupWithDeviceInfos(const DeviceInfoList& deviceInfos, bool clearUntrackedDeviceFollowups,
                                                  bool allowForcePost);

    void _clearFollowUpWithDevices(const DeviceList& devices);
    // A dismissal always names a device: without a serial number it would take away the older layout's item, and have
    // nothing to remember.
    void dismissFollowUpForSerialNumber(const std::string& serialNumber) override;
    std::size_t pendingFollowUpCount() override;
    // Turns the one item of the older single-device layout into the device's own or, when its record was not found,
    // takes it away. Does nothing when anything else is pending.
    void migrateLegacyFollowUpIfNeededWithDeviceInfo(const std::shared_ptr<VRXDeviceInfo>& deviceInfo) override;

    static std::string uniqueIdentfierForSerialNumber(const std::optional<std::string>& serialNumber);
    // Fills the item from the record, which the device info must have.
    void _setupFollowUpItem(platform::FollowUpItem& item, const std::shared_ptr<VRXDeviceInfo>& deviceInfo) const;

private:
    void update(platform::FollowUpItem& item, const std::shared_ptr<VRXDeviceInfo>& deviceInfo);
    bool repost(const DeviceInfoList& deviceInfos);

    const std::shared_ptr<VRXFollowUpProvider> followUpProvider_;
};

}  // namespace vrx
