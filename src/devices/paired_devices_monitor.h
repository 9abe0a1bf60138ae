// Reacts to a watch that is paired or unpaired: has every device's record looked up and all follow-ups refreshed, and
// the follow-up post scheduled when a device now waits for its post. Started once; it listens until its end. Main
// thread; replies may come on any other.
#pragma once

#include <cstddef>
#include <cstdint>
#include <functional>
#include <memory>
#include <optional>

#include "vrx/platform/date.h"
#include "vrx/protocols/agent_protocol.h"

namespace vrx {

class VRXPairedDevicesMonitor final : public std::enable_shared_from_this<VRXPairedDevicesMonitor> {
public:
    // What it needs of the parts that schedule. Start-up hands it in.
    struct Posts {
        // When the devices' next follow-up is to be posted; nothing when none is.
        std::function<std::optional<platform::Date>(const DeviceInfoList& deviceInfos)> nextDate;
        std::function<void(platform::Date date)> schedule;
    };

    static std::shared_ptr<VRXPairedDevicesMonitor> initWithAgent(std::shared_ptr<VRXAgentProtocol> agent, Posts posts);
    ~VRXPairedDevicesMonitor();
    VRXPairedDevicesMonitor(const VRXPairedDevicesMonitor&) = delete;
    VRXPairedDevicesMonitor& operator=(const VRXPairedDevicesMonitor&) = delete;

    void start();

    // The notification carries nothing.
    void _pairedOrActiveDevicesDidChange(std::nullptr_t notification);
    void _updatePariedDevicesFollowUp();

private:
    VRXPairedDevicesMonitor(std::shared_ptr<VRXAgentProtocol> agent, Posts posts);
    std::int32_t listenFor(std::string_view notification);

    std::int32_t pairNotifyToken = 0;  // 0 while it does not listen
    std::int32_t unpairNotifyToken = 0;
    const std::shared_ptr<VRXAgentProtocol> agent;
    const Posts posts_;
};

}  // namespace vrx
