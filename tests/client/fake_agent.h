// An agent whose answers a test sets.
#pragma once

#include <functional>
#include <mutex>
#include <optional>
#include <string>
#include <thread>
#include <vector>

#include "vrx/coverage/records/warranty.h"
#include "vrx/devices/records/device.h"
#include "vrx/devices/records/device_info.h"
#include "vrx/protocols/agent_protocol.h"

namespace vrx::test {

using platform::Value;

// Answers at once, unless the test gives an answer of its own.
class FakeAgent : public VRXAgentProtocol {
public:
    std::function<void(std::string, Reply<std::shared_ptr<VRXDeviceInfo>>)> onDeviceInfo;
    std::function<void(Reply<bool>)> onOutreach;
    std::function<void(std::string, Reply<Value>)> onStore;

    std::shared_ptr<VRXDevice> device =
        VRXDevice::deviceWithName("Phone", "SN1", platform::dateFromEpoch(1.5e9), VRXDeviceTypeDefault);
    Value record = platform::Dictionary{{"covered", true}};

    // The requests so far, with their arguments.
    std::vector<std::string> requests() {
        std::lock_guard lock(mutex_);
        return requests_;
    }
    std::shared_ptr<VRXDeviceInfo> info() const {
        return VRXDeviceInfo::deviceInfoWithDevice(device, VRXWarranty::initWithDictionary(record));
    }

    void scheduleOutreachWithReply(Reply<bool> reply) override {
        note("outreach");
        if (onOutreach) return onOutreach(std::move(reply));
        reply(true);
    }
    void checkIsAvailableInStore(std::string bundle, Reply<Value> reply) override {
        note("store " + bundle);
        if (onStore) return onStore(std::move(bundle), std::move(reply));
        reply(platform::Dictionary{{"price", 0.5}, {"$id", 7}});
    }
    void appSupportAvailability(std::string bundle, Reply<Value> reply) override {
        note("support " + bundle);
        reply(nullptr);
    }
    void readWebURLOverride(Reply<std::optional<std::string>> reply) override {
        note("url");
        reply("https://web.example");
    }
    void defaultDevice(Reply<std::shared_ptr<VRXDevice>> reply) override {
        note("device");
        reply(device);
    }
    void pairedDevices(Reply<DeviceList> reply) override {
        note("paired");
        reply({device, VRXDevice::deviceWithName(std::nullopt, std::nullopt, std::nullopt, VRXDeviceTypeWatch)});
    }
    void getDefaultDeviceInfoUsingPolicy(VRXWarrantyLookupPolicy policy,
                                         Reply<std::shared_ptr<VRXDeviceInfo>> reply) override {
        note("info " + std::to_string(policy));
        reply(info());
    }
    void getDeviceInfoForSerialNumber(std::string serialNumber, VRXWarrantyLookupPolicy policy,
                                      Reply<std::shared_ptr<VRXDeviceInfo>> reply) override {
        note("info " + serialNumber + " " + std::to_string(policy));
        if (onDeviceInfo) return onDeviceInfo(std::move(serialNumber), std::move(reply));
        reply(info());
    }
    void getAllDeviceInfosUsingPolicy(VRXWarrantyLookupPolicy policy, bool updateFollowUps,
                                      Reply<DeviceInfoList> reply) override {
        note("all " + std::to_string(policy) + (updateFollowUps ? " update" : ""));
        // From another thread, as the agent does.
        std::thread([infos = DeviceInfoList{info(), info()}, reply = std::move(reply)]() mutable {
            reply(std::move(infos));
        }).detach();
    }
    void dismissFollowUpForSerialNumber(std::string serialNumber, Reply<bool> completion) override {
        note("dismiss " + serialNumber);
        completion(true);
    }

private:
    void note(std::string request) {
        std::lock_guard lock(mutex_);
        requests_.push_back(std::move(request));
    }
    std::mutex mutex_;
    std::vector<std::string> requests_;
};

}  // namespace vrx::test
