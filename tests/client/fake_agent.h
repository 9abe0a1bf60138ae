// An agent whose answers a test sets, behind the host's real listener: the listener runs on a thread of its own, as the
// agent's main thread, and entitles callers as the test says.
#pragma once

#include <gtest/gtest.h>

#include <atomic>
#include <condition_variable>
#include <functional>
#include <mutex>
#include <optional>
#include <thread>

#include "vrx/client/agent_connection.h"
#include "vrx/host/ipc/service_listener.h"
#include "vrx/host/log/system_log.h"
#include "vrx/host/loop/main_loop.h"
#include "vrx/platform/limits.h"
#include "vrx/platform/platform.h"
#include "vrx/wire/names.h"

namespace vrx::test {

using platform::Value;

// A gate for threads to meet at.
class Signal {
public:
    void set() {
        std::lock_guard lock(mutex_);
        isSet_ = true;
        changed_.notify_all();
    }
    void reset() {
        std::lock_guard lock(mutex_);
        isSet_ = false;
    }
    void wait() {
        std::unique_lock lock(mutex_);
        changed_.wait(lock, [this] { return isSet_; });
    }

private:
    std::mutex mutex_;
    std::condition_variable changed_;
    bool isSet_ = false;
};

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

// The service of a fake agent, at a socket in a temporary folder.
class FakeService final : public platform::ServiceListenerDelegate {
public:
    explicit FakeService(std::shared_ptr<FakeAgent> agent, const host::ServiceLimits& limits = {},
                         bool isEntitled = true)
        : agent_(std::move(agent)), isEntitled_(isEntitled) {
        char name[] = "/tmp/vrx-client-XXXXXX";
        folder_ = mkdtemp(name);
        start(limits);
    }
    ~FakeService() override {
        stop();
        rmdir(folder_.c_str());
    }

    std::string socketPath() const { return folder_ + "/socket"; }

    void start(const host::ServiceLimits& limits = {}) {
        Signal isReady;
        thread_ = std::thread([this, &isReady, limits] {
            host::MainLoop loop;
            lifecycle_.emplace(loop);
            host::ServiceListenerFactory factory(loop.event(), bundles_, *lifecycle_, limits);
            auto error = factory.open(socketPath());
            if (error) throw std::runtime_error(error->text);
            listen(factory);
            factory_ = &factory;
            loop_ = &loop;
            isReady.set();
            loop.run();
            while (lifecycle_->isEnding()) {  // and the next process takes over the socket
                listener_.reset();
                lifecycle_.emplace(loop);
                listen(factory);
                ++ends_;
                ends_.notify_all();
                loop.run();
            }
            mayEnd_.wait();
            listener_.reset();
        });
        isReady.wait();
    }

    // The agent's process ends.
    void stop() {
        if (!thread_.joinable()) return;
        loop_->stop();
        mayEnd_.set();  // the loop is of no more use to this thread
        thread_.join();
        mayEnd_.reset();
    }

    // The agent ends and comes back, while its service manager keeps the socket.
    void restart() {
        Signal isBack;
        loop_->post([&] {
            listener_.reset();
            listen(*factory_);
            isBack.set();
        });
        isBack.wait();
    }

    // The agent ends by itself once nothing is under way, and comes back.
    void exitCleanWhenIdle() {
        loop_->post([this] { lifecycle_->exitCleanWhenIdle(); });
    }
    int ends() const { return ends_; }
    void waitForEnd(int number) const {
        for (int ends; (ends = ends_) < number;) ends_.wait(ends);
    }

private:
    void listen(host::ServiceListenerFactory& factory) {
        listener_ = factory.makeListener("");
        listener_->setDelegate(this);
        listener_->resume();
    }

    bool shouldAcceptNewConnection(platform::ServiceListener&, platform::ServiceConnection& connection) override {
        // Test programs have no bundle; the refusal names the entitlement all the same.
        if (connection.valueForEntitlement("test.entitlement").isNull() && !isEntitled_) return false;
        connection.setExportedInterface(VRXAgentProtocol::protocolName);
        connection.setExportedObject(agent_);
        connection.resume();
        return true;
    }

    host::SystemLog log_{platform::Level::Error};
    platform::Platform platform_{{.systemLog = &log_}};
    platform::ScopedPlatform current_{platform_};
    const std::shared_ptr<FakeAgent> agent_;
    const bool isEntitled_;
    std::string folder_;
    host::BundleLookup bundles_;
    std::thread thread_;
    host::MainLoop* loop_ = nullptr;
    Signal mayEnd_;
    std::optional<host::ProcessLifecycle> lifecycle_;
    std::atomic<int> ends_ = 0;
    host::ServiceListenerFactory* factory_ = nullptr;
    std::unique_ptr<platform::ServiceListener> listener_;
};

// A test with an agent of its own, which is served from the beginning.
class WithFakeAgent : public testing::Test {
protected:
    using Outreach = VRXAgentProtocol::Reply<bool>;

    // Serves anew, in another way than the usual one.
    void serve(const host::ServiceLimits& limits, bool isEntitled = true) {
        service.emplace(agent, limits, isEntitled);
    }
    client::ConnectionOptions options() const { return {.socketPath = service->socketPath()}; }

    // The agent owes the replies to requests for an outreach from now on.
    void holdOutreach() {
        agent->onOutreach = [this](Outreach reply) { hold(std::move(reply)); };
    }
    void hold(Outreach reply) {
        std::lock_guard lock(mutex_);
        replies_.push_back(std::move(reply));
        ++held;
        held.notify_all();
    }
    void awaitHeld(int number = 1) const {
        for (int count; (count = held) < number;) held.wait(count);
    }
    void answerHeld() {
        std::lock_guard lock(mutex_);
        for (Outreach& reply : replies_) reply(true);
    }

    std::shared_ptr<FakeAgent> agent = std::make_shared<FakeAgent>();
    std::atomic<int> held = 0;
    std::mutex mutex_;
    std::vector<Outreach> replies_;
    std::optional<FakeService> service{std::in_place, agent};  // goes first
};

}  // namespace vrx::test
