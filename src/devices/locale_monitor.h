// Reacts to a change of the system language. When follow-ups are shown, in the old language, it has the records looked
// up, which downloads them anew, and the follow-ups refreshed. Then it lets the process end, so that the next one
// begins in the new language. Started once; it listens until it is destroyed. It belongs to the main thread; replies
// may come on any thread.
// A leading "_" is spelled so on purpose; "Names" in docs/architecture.md says why.
#pragma once

#include <cstdint>
#include <functional>
#include <memory>

#include "vrx/protocols/agent_collaborators.h"
#include "vrx/protocols/agent_protocol.h"

namespace vrx {

class VRXLocaleMonitor final : public std::enable_shared_from_this<VRXLocaleMonitor> {
public:
    using MakeFollowUp = std::function<std::shared_ptr<VRXFollowUpManaging>()>;

    static std::shared_ptr<VRXLocaleMonitor> initWithAgent(std::shared_ptr<VRXAgentProtocol> agent,
                                                           MakeFollowUp makeFollowUp);
    ~VRXLocaleMonitor();
    VRXLocaleMonitor(const VRXLocaleMonitor&) = delete;
    VRXLocaleMonitor& operator=(const VRXLocaleMonitor&) = delete;

    void start();

    // Called five seconds after each notification.
    void localeDidChange();

private:
    VRXLocaleMonitor(std::shared_ptr<VRXAgentProtocol> agent, MakeFollowUp makeFollowUp);
    static void callLater(std::weak_ptr<VRXLocaleMonitor> monitor);

    std::int32_t _languageNotifyToken = 0;  // 0 while it does not listen
    const std::shared_ptr<VRXAgentProtocol> agent;
    const MakeFollowUp makeFollowUp_;
};

}  // namespace vrx
