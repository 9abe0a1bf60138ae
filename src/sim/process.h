// The life of the simulated process. It can be killed at any moment, started anew, and taken through a boot; everything
// in memory is then lost and everything stored kept. When it asks to exit and no work is in flight any more, it ends
// and the host starts it anew, as a service manager would.
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
#include "vrx/sim/http.h"
#include "vrx/sim/notification_center.h"
#include "vrx/sim/queues.h"

namespace vrx::sim {

class Process final : public platform::ProcessLifecycle {
public:
    Process(Queues& queues, DefaultsStore& defaults, BackgroundActivities& activities,
            NotificationCenter& notifications, HttpSessions& http);

    void exitCleanWhenIdle() override { isExitWanted_ = true; }
    platform::WorkInFlight beginWork() override { return inFlight_; }

    // Makes the object that lives as long as the process.
    using Main = std::function<std::shared_ptr<void>()>;
    void launch(Main main);
    // Ends the process at once, whatever is under way.
    void kill();
    // After a kill, starts another process with the same main.
    void relaunch();
    void restart() {
        kill();
        relaunch();
    }
    void reboot(platform::Duration downTime = platform::Duration(60));

    // Called at the end of each start.
    void setStartHandler(std::function<void()> handler) { startHandler_ = std::move(handler); }

    bool isRunning() const { return content_ != nullptr; }
    // How often the process ended because it asked to.
    int cleanExits() const { return cleanExits_; }

    // What is posted while the process starts has this cause.
    static constexpr std::string_view startCause = "start";
    // The version of the agent that is started next.
    std::string agentVersion = "1";

private:
    bool isIdle() const;
    void exitIfWanted();

    Queues& queues_;
    DefaultsStore& defaults_;
    BackgroundActivities& activities_;
    NotificationCenter& notifications_;
    HttpSessions& http_;
    Main main_;
    std::function<void()> startHandler_ = [] {};
    std::shared_ptr<void> content_;
    // Each piece of work in flight holds a share of it. Each process has another one, so that what a killed process
    // held does not count for the next.
    platform::WorkInFlight inFlight_ = std::make_shared<int>();
    bool isExitWanted_ = false;
    int cleanExits_ = 0;
};

}  // namespace vrx::sim
