// Waiting for a lock that another process can hold, or that another thread holds while it waits for such a one. It ends
// early when the process is told to end, and the main loop, once it runs, does not wait at all.
#pragma once

#include <atomic>
#include <chrono>
#include <csignal>
#include <mutex>
#include <thread>

#include "vrx/host/base/request_scope.h"

namespace vrx::host {

class LockWait {
public:
    using SteadyClock = std::chrono::steady_clock;

    explicit LockWait(std::chrono::milliseconds limit) : end_(SteadyClock::now() + limit) {}

    // Waits a moment before the next attempt. False when there is to be none.
    bool again() const {
        if (isOver()) return false;
        RequestScope::handOverLines();
        std::this_thread::sleep_for(std::chrono::milliseconds(2));
        return true;
    }

    // Whether there is to be no further attempt.
    bool isOver() const { return isForbidden_ || isToldToEnd() || SteadyClock::now() >= end_; }

    // Takes a mutex of this process. On a thread that must not wait it tries only for as long as others hold it without
    // waiting themselves.
    static std::unique_lock<std::mutex> take(std::mutex& mutex) {
        std::unique_lock lock(mutex, std::try_to_lock);
        if (!lock) RequestScope::handOverLines();
        if (!lock && !isForbidden_) lock.lock();
        for (int tries = 0; !lock && tries < 20; ++tries) {
            std::this_thread::sleep_for(std::chrono::milliseconds(1));
            static_cast<void>(lock.try_lock());
        }
        return lock;
    }

    // While one is alive, its thread does not wait.
    class Forbidden {
    public:
        Forbidden() { isForbidden_ = true; }
        ~Forbidden() { isForbidden_ = false; }
        Forbidden(const Forbidden&) = delete;
        Forbidden& operator=(const Forbidden&) = delete;
    };

    // From now on, or no longer, nobody in this process waits.
    static void setEnding(bool isEnding) { isEnding_ = isEnding; }

private:
    // By the main loop, or by a signal that waits until the loop runs.
    static bool isToldToEnd() {
        sigset_t waiting;
        return isEnding_ || (sigpending(&waiting) == 0 && sigismember(&waiting, SIGTERM) == 1);
    }

    static inline thread_local bool isForbidden_ = false;
    static inline std::atomic<bool> isEnding_ = false;
    const SteadyClock::time_point end_;
};

}  // namespace vrx::host
