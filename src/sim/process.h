// The life of the simulated process. It can be killed at any moment, with everything in memory gone and everything
// stored kept, started anew, and taken through a boot. When it asks to exit and nothing is under way any more, it ends
// and, as a service manager would, the host starts it anew.
//
//     host.process.launch([] { return std::make_shared<StartUp>(); });
//     host.runFor(1h);
//     host.process.restart();
#pragma once

#include <functional>
#include <memory>
#include <string>

#include "vrx/platform/process_lifecycle.h"
#include "vrx/sim/background_activities.h"
#include "vrx/sim/defaults_store.h"
#include "vrx/sim/notification_center.h"
#include "vrx/sim/queues.h"

namespace vrx::sim {

class Process final : public platform::ProcessLifecycle {
public:
    Process(Queues& queues, DefaultsStore& defaults, BackgroundActivities& activities,
            NotificationCenter& notifications);

    void exitCleanWhenIdle() override { isExitWanted_ = true; }
    platform::WorkInFlight beginWork() override { return inFlight_; }

    // Makes what lives as long as the process.
    using Main = std::function<std::shared_ptr<void>()>;
    void launch(Main main);
    // At once, whatever is under way.
    void kill();
    // What comes after a kill: another process with the same main.
    void relaunch();
    void restart() {
        kill();
        relaunch();
    }
    void reboot(platform::Duration downTime = platform::Duration(60));

    bool isRunning() const { return content_ != nullptr; }
    // How often it has ended because it asked to.
    int cleanExits() const { return cleanExits_; }

    // Of the agent that is started next.
    std::string agentVersion = "1";

private:
    bool isIdle() const;
    void exitIfWanted();

    Queues& queues_;
    DefaultsStore& defaults_;
    BackgroundActivities& activities_;
    NotificationCenter& notifications_;
    Main main_;
    std::shared_ptr<void> content_;
    // Each piece of work in flight holds a share in it. Another one for each process: what a killed one held is nothing
    // to the next.
    platform::WorkInFlight inFlight_ = std::make_shared<int>();
    bool isExitWanted_ = false;
    int cleanExits_ = 0;
};

}  // namespace vrx::sim
