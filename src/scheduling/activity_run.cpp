#include "vrx/scheduling/activity_run.h"

#include "vrx/platform/platform.h"
#include "vrx/platform/queue.h"
#include "vrx/scheduling/scheduler.h"

namespace vrx {

namespace {

// So long that no process sees a watch fire: a run ends by its work. Cutting runs off sooner is not wanted, as each
// begins its downloads anew.
constexpr platform::Duration deferralWatchInterval{2'000'000'000.0};

}  // namespace

std::shared_ptr<platform::RepeatingTimer> makeDeferralWatch(const std::shared_ptr<VRXScheduler>& scheduler,
                                                            std::function<void()> defer) {
    return platform::RepeatingTimer::schedule(platform::Platform::current().queues().mainQueue(), deferralWatchInterval,
                                              [asked = std::weak_ptr(scheduler), defer = std::move(defer)] {
                                                  auto scheduler = asked.lock();
                                                  if (scheduler && scheduler->shouldDefer()) defer();
                                              });
}

}  // namespace vrx
