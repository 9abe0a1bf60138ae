// A fake agent behind the host's real listener: the listener runs on a thread of its own, as the agent's main thread,
// and entitles callers as the test says.
#pragma once

#include <algorithm>
#include <atomic>
#include <mutex>
#include <optional>
#include <thread>

#include "client/fake_agent.h"
#include "client/fake_host.h"
#include "host/support.h"
#include "support/eventually.h"
#include "vrx/client/agent_connection.h"
#include "vrx/host/ipc/service_listener.h"
#include "vrx/host/loop/main_loop.h"

namespace vrx::test {

// Lets one thread go on that waits, or the next that does.
class Signal {
public:
    void set() { isSet_ = true; }
    void wait() {
        eventually([&] { return isSet_.exchange(false); }, "another thread's signal");
    }

private:
    std::atomic<bool> isSet_ = false;
};

// The service of a fake agent, at a socket in a temporary folder.
class FakeService final : public platform::ServiceListenerDelegate {
public:
    explicit FakeService(std::shared_ptr<FakeAgent> agent, const host::ServiceLimits& limits = {},
                         bool isEntitled = true)
        : agent_(std::move(agent)), isEntitled_(isEntitled) {
        start(limits);
    }
    ~FakeService() override { stop(); }

    FakeHost host;

    std::string socketPath() const { return folder_ / "socket"; }
    long logged(std::string_view text) const {
        return std::ranges::count_if(log_.lines(), [=](const auto& line) { return line.find(text) != line.npos; });
    }

    void start(const host::ServiceLimits& limits = {}) {
        Signal isReady;
        thread_ = std::thread([this, &isReady, limits] {
            host::MainLoop loop;
            lifecycle_.emplace(loop);
            host::ServiceListenerFactory factory(loop.event(), bundles_, *lifecycle_, limits, &host);
            auto error = factory.open(socketPath());
            if (error) throw std::runtime_error(error->text);
            listen(factory);
            factory_ = &factory;
            loop_ = &loop;
            isReady.set();
            loop.run();
            while (lifecycle_->isEnding()) {  // and the next process takes over the socket
                if (onEnding) onEnding();
                listener_.reset();
                lifecycle_.emplace(loop);
                listen(factory);
                ++ends_;
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
    std::function<void()> onEnding;  // on the service's thread, which still has its connections
    int ends() const { return ends_; }
    void waitForEnd(int number) const {
        eventually([&] { return ends_ >= number; }, "the agent's end");
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

    host::LogRecorder log_;
    const std::shared_ptr<FakeAgent> agent_;
    const bool isEntitled_;
    host::TemporaryFolder folder_;
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
    }
    void awaitHeld(int number = 1) const {
        eventually([&] { return held >= number; }, "the request");
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
