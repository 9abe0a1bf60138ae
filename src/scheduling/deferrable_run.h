// One run of an activity that may end in two ways: by its work, or by the watch that defers it when the system asks for
// deferral. Whichever comes first takes the completion handler and gives the result; the other finds none. Any thread
// may use it.
#pragma once

#include <functional>
#include <memory>
#include <mutex>
#include <utility>

#include "vrx/platform/timer.h"
#include "vrx/scheduling/scheduler_activity_delegate.h"

namespace vrx {

class DeferrableRun {
public:
    using CompletionHandler = VRXSchedulerActivityDelegate::CompletionHandler;

    explicit DeferrableRun(CompletionHandler completionHandler) : completionHandler_(std::move(completionHandler)) {}

    // Returns the completion handler to whoever ends the run; empty once the run has ended.
    CompletionHandler end() {
        std::lock_guard lock(mutex_);
        return std::move(completionHandler_);
    }

private:
    std::mutex mutex_;
    CompletionHandler completionHandler_;
};

// Calls on the main queue, at long intervals, as long as the system asks the scheduler for deferral. Holds the
// scheduler weakly.
std::shared_ptr<platform::RepeatingTimer> makeDeferralTimer(const std::shared_ptr<VRXScheduler>& scheduler,
                                                            std::function<void()> defer);

// A watch over a run: calls defer(activity, run), on the main queue, when the system asks the scheduler for deferral.
// The activity owns the watch, so the watch holds activity and run weakly; the pending work owns the run.
template <class Activity, class Run, class Defer>
std::shared_ptr<platform::RepeatingTimer> makeDeferralWatch(const std::shared_ptr<VRXScheduler>& scheduler,
                                                            std::weak_ptr<Activity> activity,
                                                            const std::shared_ptr<Run>& run, Defer defer) {
    return makeDeferralTimer(scheduler, [activity = std::move(activity), run = std::weak_ptr(run), defer] {
        auto watchedActivity = activity.lock();
        auto watchedRun = run.lock();
        if (watchedActivity && watchedRun) defer(watchedActivity, *watchedRun);
    });
}

}  // namespace vrx
