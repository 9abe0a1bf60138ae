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
    std::function<void()> released;  // outside the lock: it may hold whoever calls
    std::lock_guard lock(mutex_);
    released.swap(fire_);
}

// A queue can't take a delayed task back: what stays there once nobody holds the timer is an empty hull. It stays a day
// at most, however long the interval is, so that hulls don't pile up.
void RepeatingTimer::wait(Duration left) {
    constexpr Duration longestStep{86400.0};
    const Duration step = std::min(left, longestStep);
    queue_.postAfter(step, [timer = weak_from_this(), left = left - step] {
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
