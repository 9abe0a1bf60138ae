#include "vrx/scheduling/deferrable_run.h"

#include "vrx/platform/platform.h"
#include "vrx/platform/queue.h"
#include "vrx/scheduling/scheduler.h"

namespace vrx {

namespace {

// So long that no process lives to see a watch fire: a run ends by its work. Deferring it sooner would cost more than
// it saves, because the next run starts its downloads from the beginning.
constexpr platform::Duration deferralWatchInterval{2'000'000'000.0};

}  // namespace

std::shared_ptr<platform::RepeatingTimer> makeDeferralTimer(const std::shared_ptr<VRXScheduler>& scheduler,
                                                            std::function<void()> defer) {
    return platform::RepeatingTimer::schedule(platform::Platform::current().queues().mainQueue(), deferralWatchInterval,
                                              [asked = std::weak_ptr(scheduler), defer = std::move(defer)] {
                                                  auto scheduler = asked.lock();
                                                  if (scheduler && scheduler->shouldDefer()) defer();
                                              });
}

}  // namespace vrx
