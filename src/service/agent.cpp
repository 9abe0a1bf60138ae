#include "vrx/service/agent.h"

#include <mutex>
#include <utility>

#include "vrx/coverage/records/warranty.h"
#include "vrx/devices/devices_manager.h"
#include "vrx/devices/records/device.h"
#include "vrx/devices/records/device_info.h"
#include "vrx/devices/utilities.h"
#include "vrx/platform/defaults_store.h"
#include "vrx/platform/log.h"
#include "vrx/platform/platform.h"
#include "vrx/platform/settings_keys.h"
#include "vrx/platform/vendor.h"
#include "vrx/serverversion/server_version_utilities.h"
#include "vrx/service/default_warranty_provider.h"

namespace vrx {

using platform::Level;
using platform::Platform;
using platform::Value;

namespace {

constexpr platform::Duration outreachDelay{1.0};

// The tables in which testers let one serial number stand for another. The first that holds the serial number counts.
constexpr std::string_view overrideTables[] = {platform::settings::pairedWatchesSerialNumbers,
                                               "PairedBluetoothDevicesSerialNumbers"};

std::string withOverride(std::string serialNumber) {
    for (std::string_view table : overrideTables) {
        Value serialNumbers = Platform::current().defaultsStore().dictionary(table);
        if (const std::string* override = serialNumbers[serialNumber].asString()) {
            log(Level::Debug, "Override Serial Number: %@ found for SN: %@", *override, serialNumber);
            return *override;
        }
    }
    return serialNumber;
}

std::shared_ptr<VRXDevice> deviceForSerialNumber(VRXAgentDeviceProvider& provider, const std::string& serialNumber) {
    DevicesBySerialNumber devices = provider.allDevices();
    auto known = devices.find(serialNumber);
    if (known != devices.end()) return known->second;
    return VRXDevice::deviceWithName("<unknown>", serialNumber, std::nullopt, VRXDeviceTypeOther);
}

// The device infos of one all-devices request, in the order in which their lookups ended. Lookups may end at the same
// time.
class CollectedInfos {
public:
    void append(std::shared_ptr<VRXDeviceInfo> info) {
        std::lock_guard lock(mutex_);
        infos_.push_back(std::move(info));
    }
    // Called once all lookups have ended.
    DeviceInfoList take() {
        std::lock_guard lock(mutex_);
        return std::move(infos_);
    }

private:
    std::mutex mutex_;
    DeviceInfoList infos_;
};

}  // namespace

VRXAgent::VRXAgent(std::shared_ptr<VRXAgentWarrantyProvider> warrantyProvider,
                   std::shared_ptr<VRXAgentDeviceProvider> deviceProvider, AgentCollaborators collaborators)
    : _policyLookupQueue(
          Platform::current().queues().makeSerialQueue(platform::vendorIdentifier(".vireo.vrxagent.policyqueue"))),
      warrantyProvider_(std::move(warrantyProvider)),
      deviceProvider_(std::move(deviceProvider)),
      collaborators_(std::move(collaborators)) {}

std::shared_ptr<VRXAgent> VRXAgent::initWithCallingProcessBundleID(const std::optional<std::string>& bundleIdentifier,
                                                                   AgentCollaborators collaborators) {
    if (!bundleIdentifier)
        log(Level::Default, "%s: callingProcessBundleID is nil. Falling back to Preferences Bundle ID",
            "-[VRXAgent initWithCallingProcessBundleID:]");
    auto warrantyProvider = std::make_shared<VRXAgentDefaultWarrantyProvider>(
        bundleIdentifier ? *bundleIdentifier : platform::vendorIdentifier(platform::settingsAppRemainder),
        collaborators);
    return initWithWarrantyProvider(std::move(warrantyProvider), VRXDevicesManager::sharedManager(),
                                    std::move(collaborators));
}

std::shared_ptr<VRXAgent> VRXAgent::initWithWarrantyProvider(std::shared_ptr<VRXAgentWarrantyProvider> warrantyProvider,
                                                             std::shared_ptr<VRXAgentDeviceProvider> deviceProvider,
                                                             AgentCollaborators collaborators) {
    return std::shared_ptr<VRXAgent>(
        new VRXAgent(std::move(warrantyProvider), std::move(deviceProvider), std::move(collaborators)));
}

void VRXAgent::scheduleOutreachWithReply(Reply<bool> reply) {
    log(Level::Default, "scheduling new outreach");
    if (collaborators_.scheduleOutreach) collaborators_.scheduleOutreach(outreachDelay);
    reply(true);
}

void VRXAgent::checkIsAvailableInStore(std::string bundleIdentifier, Reply<Value> reply) {
    log(Level::Default, "Checking for %@ in the Marketplace", bundleIdentifier);
    if (!collaborators_.makeSupportManager) return reply(nullptr);
    collaborators_.makeSupportManager()->checkIsAvailableInStore(std::move(bundleIdentifier), std::move(reply));
}

void VRXAgent::appSupportAvailability(std::string bundleIdentifier, Reply<Value> reply) {
    log(Level::Default, "Availability for %@", bundleIdentifier);
    if (!collaborators_.makeSupportManager) return reply(nullptr);
    collaborators_.makeSupportManager()->appSupportAvailability(std::move(bundleIdentifier), std::move(reply));
}

void VRXAgent::readWebURLOverride(Reply<std::optional<std::string>> reply) {
    std::optional<std::string> url;
    if (VRXUtilities::isInternal()) {
        Value override = VRXServerVersionUtilities::readWebURLOverride();
        log(Level::Default, "readWebURLOverride = %@", override);
        if (const std::string* text = override.asString()) url = *text;  // the reply carries a string or null
    }
    if (reply) reply(std::move(url));
}

void VRXAgent::defaultDevice(Reply<std::shared_ptr<VRXDevice>> reply) {
    reply(deviceProvider()->defaultDevice());
}

void VRXAgent::pairedDevices(Reply<DeviceList> reply) {
    DeviceList devices;
    for (auto& [serialNumber, device] : deviceProvider()->pairedDevices()) devices.push_back(device);
    reply(std::move(devices));
}

void VRXAgent::getDefaultDeviceInfoUsingPolicy(VRXWarrantyLookupPolicy policy,
                                               Reply<std::shared_ptr<VRXDeviceInfo>> reply) {
    auto device = deviceProvider()->defaultDevice();
    auto serialNumber = device->serialNumber();
    auto replyInfo = [self = shared_from_this(), device = std::move(device),
                      reply = std::move(reply)](std::shared_ptr<VRXWarranty> warranty) mutable {
        auto info = VRXDeviceInfo::deviceInfoWithDevice(std::move(device), std::move(warranty));
        log(Level::Default, "getDefaultDeviceInfoUsingPolicy for device: '%@'", info);
        self->warrantyProvider()->refreshFollowupWithDeviceInfo(info);
        reply(std::move(info));
    };
    getWarrantyUsingPolicy(policy, serialNumber, std::move(replyInfo));
}

void VRXAgent::getDeviceInfoForSerialNumber(std::string requestedSerialNumber, VRXWarrantyLookupPolicy policy,
                                            Reply<std::shared_ptr<VRXDeviceInfo>> reply) {
    std::string serialNumber = withOverride(std::move(requestedSerialNumber));
    auto replyInfo = [self = shared_from_this(), serialNumber,
                      reply = std::move(reply)](std::shared_ptr<VRXWarranty> warranty) mutable {
        auto device = deviceForSerialNumber(*self->deviceProvider(), serialNumber);
        auto info = VRXDeviceInfo::deviceInfoWithDevice(std::move(device), std::move(warranty));
        log(Level::Default, "getDeviceInfoForSerialNumber for device: '%@'", info);
        self->warrantyProvider()->refreshFollowupWithDeviceInfo(info);
        reply(std::move(info));
    };
    getWarrantyUsingPolicy(policy, serialNumber, std::move(replyInfo));
}

void VRXAgent::getAllDeviceInfosUsingPolicy(VRXWarrantyLookupPolicy policy, bool updateFollowUps,
                                            Reply<DeviceInfoList> reply) {
    auto self = shared_from_this();
    auto collected = std::make_shared<CollectedInfos>();
    for (auto& [key, device] : deviceProvider()->allDevices()) {
        _group.enter();
        // The group is left when the reply has run, or was dropped at the end of the process: the group's task holds
        // the agent.
        std::shared_ptr<void> membership(nullptr, [self](void*) { self->_group.leave(); });
        getWarrantyUsingPolicy(
            policy, device->serialNumber(),
            [collected, device = device, membership = std::move(membership)](std::shared_ptr<VRXWarranty> warranty) {
                collected->append(VRXDeviceInfo::deviceInfoWithDevice(device, std::move(warranty)));
            });
    }
    _group.notify(_policyLookupQueue, [self, collected, updateFollowUps, reply = std::move(reply)]() mutable {
        DeviceInfoList infos = collected->take();
        log(Level::Default, "getAllDeviceInfosUsingPolicy: '%@'", infos);
        if (updateFollowUps) self->warrantyProvider()->refreshFollowupWithDeviceInfos(infos);
        reply(std::move(infos));
    });
}

void VRXAgent::dismissFollowUpForSerialNumber(std::string serialNumber, Reply<bool> completion) {
    warrantyProvider()->dismissFollowUpForSerialNumber(serialNumber);
    completion(true);
}

void VRXAgent::getWarrantyUsingPolicy(VRXWarrantyLookupPolicy policy, WarrantyReply reply) {
    getWarrantyUsingPolicy(policy, deviceProvider()->defaultDevice()->serialNumber(), std::move(reply));
}

}  // namespace vrx
