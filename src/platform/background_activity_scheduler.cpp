#include "vrx/platform/background_activity_scheduler.h"

#include "vrx/platform/platform.h"

namespace vrx::platform {

void BackgroundActivityScheduler::scheduleWithHandler(ActivityHandler handler) {
    Platform::current().backgroundActivities().schedule(registration_, std::move(handler));
}

bool BackgroundActivityScheduler::shouldDefer() const {
    return Platform::current().backgroundActivities().shouldDefer(identifier());
}

}  // namespace vrx::platform
