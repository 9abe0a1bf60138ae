// One run of an activity that may end in two ways: by its work, or by the watch that defers it when the system asks for
// that. Whoever comes first ends it and gives the result; what the other would give is dropped. Any thread may use it.
#pragma once

#include <mutex>
#include <utility>

#include "platform/date.h"
#include "scheduling/scheduler_activity_delegate.h"

namespace vrx {

// So long that no process sees a watch fire: a run ends by its work. Cutting runs off sooner is not wanted, as each
// begins its downloads anew.
inline constexpr platform::Duration deferralWatchInterval{2'000'000'000.0};

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

}  // namespace vrx
