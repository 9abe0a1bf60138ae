// One run of an activity that may end in two ways: by its work, or by the watch that defers it when the system asks for
// that. Whoever comes first ends it and gives the result; what the other would give is dropped. Any thread may use it.
#pragma once

#include <functional>
#include <memory>
#include <mutex>
#include <utility>

#include "vrx/platform/timer.h"
#include "vrx/scheduling/scheduler_activity_delegate.h"

namespace vrx {

class ActivityRun {
public:
    using CompletionHandler = VRXSchedulerActivityDelegate::CompletionHandler;

    explicit ActivityRun(CompletionHandler completionHandler) : completionHandler_(std::move(completionHandler)) {}

    // For who ends the run; empty when it has ended.
    CompletionHandler end() {
        std::lock_guard lock(mutex_);
        return std::move(completionHandler_);
    }

private:
    std::mutex mutex_;
    CompletionHandler completionHandler_;
};

// A watch over a run, on the main queue: calls when the system asks the scheduler for deferral. It holds the scheduler
// weakly.
std::shared_ptr<platform::RepeatingTimer> makeDeferralWatch(const std::shared_ptr<VRXScheduler>& scheduler,
                                                            std::function<void()> defer);

}  // namespace vrx
