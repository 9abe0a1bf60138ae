#include "vrx/sim/process.h"

#include <utility>

#include "vrx/platform/task.h"

namespace vrx::sim {

Process::Process(Queues& queues, DefaultsStore& defaults, BackgroundActivities& activities,
                 NotificationCenter& notifications, HttpSessions& http)
    : queues_(queues), defaults_(defaults), activities_(activities), notifications_(notifications), http_(http) {
    queues_.setIdleHandler([this] { exitIfWanted(); });
}

void Process::launch(Main main) {
    main_ = std::move(main);
    relaunch();
}

void Process::kill() {
    platform::ShutdownScope shutdown;
    queues_.discardWork();
    content_ = nullptr;
    activities_.processEnded();
    notifications_.processEnded();
    http_.processEnded();
    defaults_.forgetRegistered();
    inFlight_ = std::make_shared<int>();
    isExitWanted_ = false;
}

void Process::relaunch() {
    const CauseScope cause(queues_, startCause);
    activities_.processStarted(agentVersion);
    content_ = main_();
    startHandler_();
}

void Process::reboot(platform::Duration downTime) {
    kill();
    queues_.runFor(downTime);
    activities_.booted();
    relaunch();
}

bool Process::isIdle() const {
    return inFlight_.use_count() == 1 && !activities_.isRunning();
}

// Called between two tasks, when none is due.
void Process::exitIfWanted() {
    if (!isExitWanted_ || !isIdle()) return;
    ++cleanExits_;
    kill();
    if (main_) relaunch();
}

}  // namespace vrx::sim
