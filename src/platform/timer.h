// Calls a function on a queue once every interval, the first time after one interval. It ends when it is invalidated or
// its last holder releases it.
#pragma once

#include <functional>
#include <memory>
#include <mutex>

#include "vrx/platform/queue.h"

namespace vrx::platform {

class RepeatingTimer : public std::enable_shared_from_this<RepeatingTimer> {
public:
    // The queue must outlive the timer.
    static std::shared_ptr<RepeatingTimer> schedule(Queue& queue, Duration interval, std::function<void()> fire);

    // Any thread may call this, and so may the function itself.
    void invalidate();

private:
    RepeatingTimer(Queue& queue, Duration interval, std::function<void()> fire)
        : queue_(queue), interval_(interval), fire_(std::move(fire)) {}
    void wait(Duration left);
    void fire();

    Queue& queue_;
    const Duration interval_;
    std::mutex mutex_;
    std::function<void()> fire_;  // empty once invalidated
};

}  // namespace vrx::platform
