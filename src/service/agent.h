// The object through which every request reaches devices and coverage records. Each client connection has one, and so
// have start-up and each activity that works through one. It has no state between requests. Requests may come on any
// thread; a request under way keeps the agent alive until its reply is sent.
// A leading "_" is spelled so on purpose; "Names" in docs/architecture.md says why.
#pragma once

#include <memory>
#include <optional>
#include <string>

#include "vrx/platform/completion_group.h"
#include "vrx/platform/property.h"
#include "vrx/platform/queue.h"
#include "vrx/protocols/agent_collaborators.h"
#include "vrx/protocols/agent_device_provider.h"
#include "vrx/protocols/agent_protocol.h"
#include "vrx/protocols/agent_warranty_provider.h"

namespace vrx {

class VRXAgent final : public VRXAgentProtocol, public std::enable_shared_from_this<VRXAgent> {
public:
    using SerialNumber = VRXAgentWarrantyProvider::SerialNumber;
    using WarrantyReply = Reply<std::shared_ptr<VRXWarranty>>;

    // An agent with the default providers, for the application of that bundle identifier; null means the settings app.
    static std::shared_ptr<VRXAgent> initWithCallingProcessBundleID(const std::optional<std::string>& bundleIdentifier,
                                                                    AgentCollaborators collaborators = {});
    static std::shared_ptr<VRXAgent> initWithWarrantyProvider(
        std::shared_ptr<VRXAgentWarrantyProvider> warrantyProvider,
        std::shared_ptr<VRXAgentDeviceProvider> deviceProvider, AgentCollaborators collaborators = {});

    void scheduleOutreachWithReply(Reply<bool> reply) override;
    void checkIsAvailableInStore(std::string bundleIdentifier, Reply<platform::Value> reply) override;
    void appSupportAvailability(std::string bundleIdentifier, Reply<platform::Value> reply) override;
    void readWebURLOverride(Reply<std::optional<std::string>> reply) override;
    void defaultDevice(Reply<std::shared_ptr<VRXDevice>> reply) override;
    void pairedDevices(Reply<DeviceList> reply) override;
    void getDefaultDeviceInfoUsingPolicy(VRXWarrantyLookupPolicy policy,
                                         Reply<std::shared_ptr<VRXDeviceInfo>> reply) override;
    void getDeviceInfoForSerialNumber(std::string serialNumber, VRXWarrantyLookupPolicy policy,
                                      Reply<std::shared_ptr<VRXDeviceInfo>> reply) override;
    // Replies on the agent's policy queue. Overlapping requests of one agent are answered when the lookups of all of
    // them have ended.
    void getAllDeviceInfosUsingPolicy(VRXWarrantyLookupPolicy policy, bool updateFollowUps,
                                      Reply<DeviceInfoList> reply) override;
    void dismissFollowUpForSerialNumber(std::string serialNumber, Reply<bool> completion) override;

    // Replies with the coverage record that the policy selects, or null. Replies at once when no download is needed.
    void getWarrantyUsingPolicy(VRXWarrantyLookupPolicy policy, WarrantyReply reply);
    void getWarrantyUsingPolicy(VRXWarrantyLookupPolicy policy, const SerialNumber& serialNumber, WarrantyReply reply);

    // Moves what the older single-device layout left behind to this device, once. Start-up calls it before anything
    // else uses that data.
    void performMigrationIfNeeded();

    // Read and replaced whole. Each step of a request asks the present provider.
    std::shared_ptr<VRXAgentWarrantyProvider> warrantyProvider() const { return warrantyProvider_.get(); }
    void setWarrantyProvider(std::shared_ptr<VRXAgentWarrantyProvider> provider) {
        warrantyProvider_.set(std::move(provider));
    }
    std::shared_ptr<VRXAgentDeviceProvider> deviceProvider() const { return deviceProvider_.get(); }
    void setDeviceProvider(std::shared_ptr<VRXAgentDeviceProvider> provider) {
        deviceProvider_.set(std::move(provider));
    }

private:
    VRXAgent(std::shared_ptr<VRXAgentWarrantyProvider> warrantyProvider,
             std::shared_ptr<VRXAgentDeviceProvider> deviceProvider, AgentCollaborators collaborators);

    std::shared_ptr<platform::Queue> _policyLookupQueue;
    platform::CompletionGroup _group;  // the lookups of all-devices requests
    platform::Property<std::shared_ptr<VRXAgentWarrantyProvider>> warrantyProvider_;
    platform::Property<std::shared_ptr<VRXAgentDeviceProvider>> deviceProvider_;
    const AgentCollaborators collaborators_;
};

}  // namespace vrx
