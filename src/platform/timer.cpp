#include "platform/timer.h"

#include <utility>

namespace vrx::platform {

std::shared_ptr<RepeatingTimer> RepeatingTimer::schedule(Queue& queue, Duration interval, std::function<void()> fire) {
    std::shared_ptr<RepeatingTimer> timer(new RepeatingTimer(queue, interval, std::move(fire)));
    timer->arm();
    return timer;
}

void RepeatingTimer::invalidate() {
    std::function<void()> released;  // outside the lock: it may hold whoever calls
    std::lock_guard lock(mutex_);
    released.swap(fire_);
}

// A queue can't take a delayed task back: what stays there once nobody holds the timer is an empty hull.
void RepeatingTimer::arm() {
    queue_.postAfter(interval_, [timer = weak_from_this()] {
        if (auto self = timer.lock()) self->fire();
    });
}

void RepeatingTimer::fire() {
    std::function<void()> fire;
    {
        std::lock_guard lock(mutex_);
        fire = fire_;
    }
    if (!fire) return;
    arm();
    fire();
}

}  // namespace vrx::platform
