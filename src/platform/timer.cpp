#include "vrx/platform/timer.h"

#include <algorithm>
#include <utility>

namespace vrx::platform {

std::shared_ptr<RepeatingTimer> RepeatingTimer::schedule(Queue& queue, Duration interval, std::function<void()> fire) {
    std::shared_ptr<RepeatingTimer> timer(new RepeatingTimer(queue, interval, std::move(fire)));
    timer->wait(interval);
    return timer;
}

void RepeatingTimer::invalidate() {
    std::function<void()> released;  // released after the lock: the function may own the caller
    std::lock_guard lock(mutex_);
    released.swap(fire_);
}

// A released timer can leave an empty task behind. A long interval is waited for in steps of at most a day, so that
// such tasks do not pile up.
void RepeatingTimer::wait(Duration left) {
    constexpr Duration longestStep{86400.0};
    const Duration step = std::min(left, longestStep);
    queue_.postAfterWhile(weak_from_this(), step, [timer = weak_from_this(), left = left - step] {
        auto self = timer.lock();
        if (!self) return;
        left > Duration(0) ? self->wait(left) : self->fire();
    });
}

void RepeatingTimer::fire() {
    std::function<void()> fire;
    {
        std::lock_guard lock(mutex_);
        fire = fire_;
    }
    if (!fire) return;
    wait(interval_);
    fire();
}

}  // namespace vrx::platform
