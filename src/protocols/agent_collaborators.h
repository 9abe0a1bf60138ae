// What an agent needs of parts that need the agent in turn. Start-up, which knows all parts, passes the factories in.
// Without one of them the agent lacks that ability: it does nothing and replies with an empty result.
#pragma once

#include <cstddef>
#include <functional>
#include <memory>
#include <optional>
#include <string>

#include "vrx/platform/date.h"
#include "vrx/platform/task.h"
#include "vrx/platform/value.h"
#include "vrx/protocols/forward.h"

namespace vrx {

// Keeps the follow-ups that are shown in step with the devices and their records. Made afresh for each piece of work.
class VRXFollowUpManaging {
public:
    virtual ~VRXFollowUpManaging() = default;
    // Both return the device infos whose follow-up is shown afterwards. "Followup" is spelled so on purpose.
    virtual DeviceInfoList refreshFollowupWithDeviceInfos(const DeviceInfoList& deviceInfos) = 0;
    virtual DeviceInfoList refreshFollowupWithDeviceInfo(const std::shared_ptr<VRXDeviceInfo>& deviceInfo,
                                                         bool allowForcePost) = 0;
    // Posts the follow-ups that are due. Returns whether any was due, even if the service refused it. "DevicesInfo" is
    // spelled so on purpose.
    virtual bool postFollowUpWithDevicesInfo(const DeviceInfoList& deviceInfos) = 0;
    virtual void dismissFollowUpForSerialNumber(const std::string& serialNumber) = 0;
    virtual void migrateLegacyFollowUpIfNeededWithDeviceInfo(const std::shared_ptr<VRXDeviceInfo>& deviceInfo) = 0;
    // How many follow-ups are shown; 0 when the service does not tell.
    virtual std::size_t pendingFollowUpCount() = 0;
};

// Answers whether an application is available. Made afresh for each question; it calls the reply exactly once.
class VRXSupportManaging {
public:
    virtual ~VRXSupportManaging() = default;
    virtual void checkIsAvailableInStore(std::string bundleIdentifier,
                                         platform::OnceCallback<platform::Value> reply) = 0;
    virtual void appSupportAvailability(std::string bundleIdentifier,
                                        platform::OnceCallback<platform::Value> reply) = 0;
};

struct AgentCollaborators {
    std::function<std::shared_ptr<VRXFollowUpManaging>()> makeFollowUp;
    std::function<void(platform::Duration delay)> scheduleOutreach;
    std::function<std::shared_ptr<VRXSupportManaging>()> makeSupportManager;
};

}  // namespace vrx
