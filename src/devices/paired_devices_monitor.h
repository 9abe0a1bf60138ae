// Reacts to a watch that is paired or unpaired. It has every device's record looked up and all follow-ups refreshed,
// and schedules the follow-up post when a device now waits for its post. Started once; it listens until it is
// destroyed. It belongs to the main thread; replies may come on any thread.
// A leading "_" is spelled so on purpose; "Names" in docs/architecture.md says why.
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
    // What the monitor needs of the parts that schedule. Start-up passes it in.
    struct Posts {
        // When the follow-up post is to run next for the devices; null when it need not run.
        std::function<std::optional<platform::Date>(const DeviceInfoList& deviceInfos)> nextDate;
        std::function<void(platform::Date date)> schedule;
    };

    static std::shared_ptr<VRXPairedDevicesMonitor> initWithAgent(std::shared_ptr<VRXAgentProtocol> agent, Posts posts);
    ~VRXPairedDevicesMonitor();
    VRXPairedDevicesMonitor(const VRXPairedDevicesMonitor&) = delete;
    VRXPairedDevicesMonitor& operator=(const VRXPairedDevicesMonitor&) = delete;

    void start();

    // The notification is always null.
    void _pairedOrActiveDevicesDidChange(std::nullptr_t notification);
    // Spelled so on purpose.
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
