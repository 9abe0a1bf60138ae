// What an agent needs of parts that need the agent in turn. Start-up, which knows them all, hands the factories in; one
// that is not there leaves the agent without that ability: it then does nothing and replies that there is nothing.
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
    // Both give the device infos whose follow-up is shown afterwards.
    virtual DeviceInfoList refreshFollowupWithDeviceInfos(const DeviceInfoList& deviceInfos) = 0;
    virtual DeviceInfoList refreshFollowupWithDeviceInfo(const std::shared_ptr<VRXDeviceInfo>& deviceInfo,
                                                         bool allowForcePost) = 0;
    // Posts what is due. Whether any was, posted or not.
    virtual bool postFollowUpWithDevicesInfo(const DeviceInfoList& deviceInfos) = 0;
    virtual void dismissFollowUpForSerialNumber(const std::string& serialNumber) = 0;
    virtual void migrateLegacyFollowUpIfNeededWithDeviceInfo(const std::shared_ptr<VRXDeviceInfo>& deviceInfo) = 0;
    // How many are shown; 0 when that cannot be told.
    virtual std::size_t pendingFollowUpCount() = 0;
};

// Answers whether an application is to be had. Made afresh for each question; it calls the reply exactly once.
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
