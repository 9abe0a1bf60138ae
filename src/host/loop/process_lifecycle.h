// When the agent may end without loss: once that was asked for and nothing is under way. It then stops the main loop,
// and the program ends. Any thread may use it, where nothing else is said.
#pragma once

#include <functional>
#include <memory>
#include <mutex>

#include "vrx/host/loop/main_loop.h"
#include "vrx/platform/process_lifecycle.h"

namespace vrx::host {

class ProcessLifecycle final : public platform::ProcessLifecycle {
public:
    // The loop must outlive the lifecycle, which pieces of work may outlive.
    explicit ProcessLifecycle(MainLoop& mainLoop) : state_(std::make_shared<State>(mainLoop)) {}
    ~ProcessLifecycle() override;
    ProcessLifecycle(const ProcessLifecycle&) = delete;
    ProcessLifecycle& operator=(const ProcessLifecycle&) = delete;

    void exitCleanWhenIdle() override;
    platform::WorkInFlight beginWork() override;
    // Null once the end is decided on: what has been sent to this process then is left to the next one.
    platform::WorkInFlight beginWorkUnlessEnding();
    // Asked on the main thread, when no work is in flight and none can begin, whether something has come in that is yet
    // to be looked at: whoever does so will begin work. Main thread.
    void setUnreadQuestion(std::function<bool()> hasUnread);

    // Whether the end is decided on.
    bool isEnding() const;

private:
    struct State {
        explicit State(MainLoop& mainLoop) : mainLoop(&mainLoop) {}

        std::mutex mutex;
        MainLoop* mainLoop;  // none when the lifecycle has gone
        std::function<bool()> hasUnread;
        int inFlight = 0;
        bool isExitWanted = false;
        bool isEnding = false;
    };
    static platform::WorkInFlight begin(const std::shared_ptr<State>& state);
    static void endIfIdle(State& state);
    static void considerEnd(const std::shared_ptr<State>& state);

    const std::shared_ptr<State> state_;
};

}  // namespace vrx::host
