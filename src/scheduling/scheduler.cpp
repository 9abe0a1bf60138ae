#include "vrx/scheduling/scheduler.h"

#include <algorithm>
#include <cstdint>
#include <string>
#include <utility>

#include "vrx/platform/clock.h"
#include "vrx/platform/defaults_store.h"
#include "vrx/platform/log.h"
#include "vrx/platform/platform.h"
#include "vrx/platform/queue.h"

namespace vrx {

using platform::BackgroundActivityResult;
using platform::Date;
using platform::Duration;
using platform::Level;
using platform::Platform;

namespace {

constexpr std::string_view targetDateSuffix = ".TargetDate";
// The delay between an activity's result and its hand-back to the system.
constexpr Duration handBackDelay{1.0};

// A duration of at least 0, truncated to whole seconds and to the largest number that the system takes.
std::int64_t wholeSeconds(Duration duration) {
    constexpr double most = 9223372036854774784.0;  // the largest double below 2^63
    return static_cast<std::int64_t>(std::min(duration.count(), most));
}

// Takes the result of a run. A finished run loses its target date; in every case the system is told.
VRXScheduler::CompletionHandler resultHandler(std::string targetDateKey, VRXScheduler::CompletionHandler block,
                                              std::shared_ptr<void> run) {
    return [key = std::move(targetDateKey), block = std::move(block),
            run = std::move(run)](BackgroundActivityResult result) mutable {
        if (result == BackgroundActivityResult::Finished) Platform::current().defaultsStore().remove(key);
        Platform::current().queues().mainQueue().postAfter(
            handBackDelay, [result, block = std::move(block), run = std::move(run)]() mutable { block(result); });
    };
}

}  // namespace

VRXScheduler::VRXScheduler(std::shared_ptr<VRXSchedulerActivityDelegate> activityDelegate)
    : BackgroundActivityScheduler(activityDelegate->identifier()), activityDelegate_(std::move(activityDelegate)) {}

std::shared_ptr<VRXScheduler> VRXScheduler::newSchedulerWithActivityDelegate(
    std::shared_ptr<VRXSchedulerActivityDelegate> activityDelegate) {
    return std::shared_ptr<VRXScheduler>(new VRXScheduler(std::move(activityDelegate)));
}

void VRXScheduler::clearScheduledActivities() {
    platform::DefaultsStore& defaults = Platform::current().defaultsStore();
    for (const auto& [key, value] : defaults.dictionaryRepresentation()) {
        if (!key.ends_with(targetDateSuffix)) continue;
        log(Level::Default, "Clearing %@", key);
        defaults.remove(key);
    }
}

void VRXScheduler::monitorForScheduledActivity() {
    log(Level::Default, "monitorForScheduledActivity for '%@'", identifier());
    setPreregistered(true);
    scheduleWithHandler(firingHandler());
}

void VRXScheduler::scheduleActivityWithDelay(Duration delay) {
    _scheduleActivityWithDelay(delay, Platform::current().clock().now() + delay);
}

void VRXScheduler::scheduleActivityForDate(std::optional<Date> date) {
    _scheduleActivityWithDelay(date ? *date - Platform::current().clock().now() : Duration(0), date);
}

void VRXScheduler::_scheduleActivityWithDelay(Duration delay, std::optional<Date> date) {
    log(Level::Default, "scheduled '%@' with delay: %.02f (%@)", identifier(), delay, date);
    setPreregistered(false);
    setRepeats(false);
    setRegisteredByOwnRun(activityDelegate()->isRunning());
    setQualityOfService(platform::QualityOfService::Background);
    if (!(delay > Duration(0))) delay = Duration(0);
    setAdditionalActivityCriteria({.delay = wholeSeconds(delay),
                                   .gracePeriod = wholeSeconds(delay / 10.0),
                                   .requiresNetwork = activityDelegate()->requiresNetwork()});
    Platform::current().defaultsStore().set(targetDateKey(identifier()),
                                            date ? platform::Value(*date) : platform::Value());
    scheduleWithHandler([self = shared_from_this()](CompletionHandler completion) {
        log(Level::Default, "activity for '%@' fired on: %@", self->identifier(), Platform::current().clock().now());
        self->performScheduledOutreachWithBlock(std::move(completion));
    });
}

std::optional<Date> VRXScheduler::scheduledActivityDate() const {
    return Platform::current().defaultsStore().date(targetDateKey(identifier()));
}

std::string VRXScheduler::targetDateKey(const std::string& identifier) {
    return identifier + std::string(targetDateSuffix);
}

void VRXScheduler::performScheduledOutreachWithBlock(CompletionHandler block) {
    std::optional<Date> date = scheduledActivityDate();
    log(Level::Default, "activity for '%@' should occur on: %@", identifier(), date);
    Duration remaining = date ? *date - Platform::current().clock().now() : Duration(0);
    const auto run = std::make_shared<char>();
    CompletionHandler handler = resultHandler(targetDateKey(identifier()), std::move(block), run);
    if (remaining <= Duration(0)) {
        log(Level::Default, "target reached for '%@', trigger activity", identifier());
        const std::shared_ptr<VRXSchedulerActivityDelegate> activity = activityDelegate();
        activity->run_.set(run);
        activity->performActivityForScheduler(shared_from_this(), std::move(handler));
    } else {
        log(Level::Default, "target not past for '%@', defer for: %.02f", identifier(), remaining);
        handler(BackgroundActivityResult::Deferred);
    }
}

platform::ActivityHandler VRXScheduler::firingHandler() {
    return [self = shared_from_this()](CompletionHandler completion) {
        self->performScheduledOutreachWithBlock(std::move(completion));
    };
}

}  // namespace vrx
