// Calls again and again, an interval apart, on a queue, first when one interval has passed, until it is invalidated or
// its last holder lets it go.
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

    // Any thread may call it, also from within the call.
    void invalidate();

private:
    RepeatingTimer(Queue& queue, Duration interval, std::function<void()> fire)
        : queue_(queue), interval_(interval), fire_(std::move(fire)) {}
    void wait(Duration left);
    void fire();

    Queue& queue_;
    const Duration interval_;
    std::mutex mutex_;
    std::function<void()> fire_;  // none once invalidated
};

}  // namespace vrx::platform
