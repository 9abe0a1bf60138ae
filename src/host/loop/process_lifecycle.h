// Ends the process without loss: once the end is asked for and no work is in flight, it stops the main loop. Any thread
// may use it, except where noted.
#pragma once

#include <functional>
#include <memory>
#include <mutex>
#include <vector>

#include "vrx/host/loop/main_loop.h"
#include "vrx/platform/process_lifecycle.h"

namespace vrx::host {

class ProcessLifecycle final : public platform::ProcessLifecycle {
public:
    // The loop must outlive the lifecycle; pieces of work may outlive both.
    explicit ProcessLifecycle(MainLoop& mainLoop) : state_(std::make_shared<State>(mainLoop)) {}
    ~ProcessLifecycle() override;
    ProcessLifecycle(const ProcessLifecycle&) = delete;
    ProcessLifecycle& operator=(const ProcessLifecycle&) = delete;

    void exitCleanWhenIdle() override;
    platform::WorkInFlight beginWork() override;
    // Returns null once the end is decided: what arrives then is left to the next process.
    platform::WorkInFlight beginWorkUnlessEnding();
    // Sets the question that is asked before the end: has something arrived that nobody has read? Whoever reads it
    // begins work. It is asked on the main thread while no work is in flight and none can begin. Main thread.
    void setUnreadQuestion(std::function<bool()> hasUnread);

    // Calls on the main thread as soon as no work is in flight.
    void callWhenIdle(std::function<void()> call);

    // The end is decided after the tasks that this queue holds at the time: they may begin work.
    void setMainQueue(std::weak_ptr<platform::Queue> queue);

    // Whether the end is decided.
    bool isEnding() const;

private:
    struct State {
        explicit State(MainLoop& mainLoop) : mainLoop(&mainLoop) {}

        std::mutex mutex;
        MainLoop* mainLoop;  // null once the lifecycle is gone
        std::weak_ptr<platform::Queue> mainQueue;
        std::function<bool()> hasUnread;
        std::vector<std::function<void()>> idleCalls;
        int inFlight = 0;
        bool isExitWanted = false;
        bool isEnding = false;
    };
    static platform::WorkInFlight begin(const std::shared_ptr<State>& state);
    static void endIfIdle(State& state);
    static void callIdle(State& state);
    static void considerEnd(const std::shared_ptr<State>& state);

    const std::shared_ptr<State> state_;
};

}  // namespace vrx::host
