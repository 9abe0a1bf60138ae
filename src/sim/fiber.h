// A call stack besides the thread's own, on which one task at a time runs and can be suspended. It belongs to one
// thread. The address and thread sanitizers are told of each switch.
#pragma once

#include <ucontext.h>

#include <cstddef>

#include "vrx/platform/task.h"

namespace vrx::sim {

class Fiber {
public:
    Fiber();
    // The fiber must be idle.
    ~Fiber();
    Fiber(const Fiber&) = delete;
    Fiber& operator=(const Fiber&) = delete;

    // Runs the task until it suspends or ends. An exception that leaves the task ends the program.
    void start(platform::Task task);
    // Continues the suspended task until it suspends again or ends.
    void resume() { enter(); }
    // Called by the task: returns to where start() or resume() was called.
    void suspend() { leave(); }
    // Whether it has no task.
    bool isIdle() const { return !isBusy_; }

private:
    static void main() noexcept;
    void runTasks();
    void enter();
    void leave();
    void arrive();

    std::byte* mapping_;  // a page that must not be touched, and above it the stack
    std::byte* stack_;
    ucontext_t inside_;
    ucontext_t outside_;
    platform::Task task_;
    bool isBusy_ = false;
    bool hasStarted_ = false;
    bool isEnding_ = false;

    // What the sanitizers must be told at the next switch.
    const void* outsideStack_ = nullptr;
    std::size_t outsideStackBytes_ = 0;
    void* outsideFakeStack_ = nullptr;
    void* insideFakeStack_ = nullptr;
    void* outsideThread_ = nullptr;
    void* insideThread_ = nullptr;
};

}  // namespace vrx::sim
