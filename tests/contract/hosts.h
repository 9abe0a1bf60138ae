// The two hosts, as contract tests see them: the simulated one, and the real one in a temporary folder. A suite that is
// to hold on both:
//
//     template <class Host>
//     class FilesContract : public ContractTest<Host> { … };
//     TYPED_TEST_SUITE(FilesContract, Hosts, HostNames);
#pragma once

#include <optional>

#include "host/support.h"
#include "vrx/host/base/files.h"
#include "vrx/host/home/defaults_store.h"
#include "vrx/host/home/follow_up_controller.h"
#include "vrx/host/loop/queues.h"
#include "vrx/host/profile/device_profile.h"
#include "vrx/sim/host.h"

namespace vrx {

class SimulatedHost {
public:
    platform::DefaultsStore& defaults() { return host.defaults; }
    platform::FollowUpControllers& followUps() { return host.followUps; }
    platform::Files& files() { return host.files; }
    platform::Queues& queues() { return host.queues; }
    // What is stored stays for the next process.
    void restart() { host.defaults.forgetRegistered(); }
    std::size_t loggedLines() const { return host.log.messages(platform::Level::Default).size(); }
    Duration time() const { return host.clock.elapsed(); }
    // Lets all queues run until the event is set.
    void runUntil(const std::shared_ptr<platform::Event>& event) { event->wait(); }

    sim::Host host;
};

class RealHost {
public:
    platform::DefaultsStore& defaults() { return *defaults_; }
    platform::FollowUpControllers& followUps() { return *followUps_; }
    platform::Files& files() { return files_; }
    platform::Queues& queues() { return queues_; }
    void restart() {
        database_.emplace(folder / "host.db");
        defaults_.emplace(*database_);
        followUps_.emplace(*database_);
    }
    std::size_t loggedLines() const { return log_.lines().size(); }
    Duration time() const { return std::chrono::steady_clock::now().time_since_epoch(); }
    void runUntil(const std::shared_ptr<platform::Event>& event) {
        queues_.workers(platform::Priority::UserInitiated).post([this, event] {
            event->wait();
            loop_.stop();
        });
        loop_.run();
    }

    host::TemporaryFolder folder;
    host::DeviceProfile profile{folder / "device.toml"};

private:
    host::LogRecorder log_;
    std::optional<host::Database> database_{folder / "host.db"};
    std::optional<host::DefaultsStore> defaults_{*database_};
    std::optional<host::FollowUpControllers> followUps_{*database_};
    host::Files files_{folder.path()};
    host::MainLoop loop_;
    host::Queues queues_{loop_, 2};
};

template <class Host>
class ContractTest : public testing::Test {
protected:
    Host host;
};

// The simulated one stands first in every list of the two.
struct HostNames {
    template <class Host>
    static std::string GetName(int index) {
        return index == 0 ? "Simulated" : "Real";
    }
};
using Hosts = testing::Types<SimulatedHost, RealHost>;

}  // namespace vrx
