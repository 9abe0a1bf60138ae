// What the host answers its clients beside the agent, through the current platform and the host's own parts: who runs
// here, what the settings app shows, and that something of it has changed. What it follows it follows only while
// somebody is subscribed.
#pragma once

#include <functional>
#include <memory>
#include <string>

#include "vrx/host/base/changes.h"
#include "vrx/host/home/home_changes.h"
#include "vrx/host/host.h"
#include "vrx/host/ipc/host_requests.h"

namespace vrx::host {

// What the agent calls its own.
struct AgentNames {
    std::string followUpClient;
    // The device that an item belongs to; null when it says none.
    std::function<const std::string*(const platform::FollowUpItem&)> serialNumberOf;
    std::function<std::string(const std::string& serialNumber)> followUpIdentifier;
    std::string recordsFolder;
};

class HostService final : public HostRequests {
public:
    // Made and destroyed on the main thread, after the host and before it. What others may call, any thread may.
    HostService(Host& host, AgentStatus status, AgentNames names);
    ~HostService() override;

    platform::Value status() const override;
    platform::Value pendingFollowUps() const override;
    void dismissFollowUp(const std::string& identifier, VRXAgentProtocol& agent,
                         VRXAgentProtocol::Reply<bool> reply) const override;
    Changes::Subscription subscribe(uid_t user, std::function<void(Changes::Kinds)> tell) override {
        return changes_->subscribe(user, std::move(tell));
    }
    void whenChangesAreTold(std::function<void()> call) override;
    std::string localeIdentifier() const override;
    platform::Duration oneDayInterval() const override;
    std::vector<ActivityState> activities() const override;

private:
    void follow(bool isAnybodySubscribed);
    void profileMayHaveChanged();
    std::string devicesText() const;

    Host& host_;
    const AgentStatus status_;
    const AgentNames names_;
    const std::shared_ptr<Changes> changes_ = std::make_shared<Changes>();
    const std::shared_ptr<platform::Queue> queue_;
    // While somebody is subscribed:
    std::unique_ptr<HomeChanges> homeChanges_;
    std::string lastDevices_;
};

}  // namespace vrx::host
