// Binds an activity to the system's background activities and adds a target date, which is kept in the settings and so
// outlives the process: a firing before it is put off and changes nothing, a firing at or after it, or without one,
// runs the activity. The system keeps the scheduler, by the handler, until another one takes the identifier. Scheduling
// belongs to one thread; everything else any thread may do.
#pragma once

#include <memory>
#include <optional>
#include <string>

#include "vrx/platform/background_activity_scheduler.h"
#include "vrx/platform/date.h"
#include "vrx/platform/property.h"
#include "vrx/scheduling/scheduler_activity_delegate.h"

namespace vrx {

class VRXScheduler final : public platform::BackgroundActivityScheduler,
                           public std::enable_shared_from_this<VRXScheduler> {
public:
    using CompletionHandler = VRXSchedulerActivityDelegate::CompletionHandler;

    // For the activity, under its identifier. Nothing is scheduled yet.
    static std::shared_ptr<VRXScheduler> newSchedulerWithActivityDelegate(
        std::shared_ptr<VRXSchedulerActivityDelegate> activityDelegate);
    // Removes the target dates of all activities.
    static void clearScheduledActivities();

    // Checks in for an activity that the system holds or fires by itself, leaving its criteria and its target date.
    void monitorForScheduledActivity();
    // Both set the target date and register the activity afresh. No date is as good as now, and leaves no target date.
    void scheduleActivityWithDelay(platform::Duration delay);
    void scheduleActivityForDate(std::optional<platform::Date> date);

    std::optional<platform::Date> scheduledActivityDate() const;
    // Of the setting that keeps an activity's target date.
    static std::string targetDateKey(const std::string& identifier);

    // What a firing of any activity does; the block is the system's completion handler. It gets the result a second
    // after the activity has given it, on the main queue.
    void performScheduledOutreachWithBlock(CompletionHandler block);
    // Does that at each firing and keeps the scheduler alive.
    platform::ActivityHandler firingHandler();

    // Read and replaced whole.
    std::shared_ptr<VRXSchedulerActivityDelegate> activityDelegate() const { return activityDelegate_.get(); }
    void setActivityDelegate(std::shared_ptr<VRXSchedulerActivityDelegate> activityDelegate) {
        activityDelegate_.set(std::move(activityDelegate));
    }

private:
    explicit VRXScheduler(std::shared_ptr<VRXSchedulerActivityDelegate> activityDelegate);
    void _scheduleActivityWithDelay(platform::Duration delay, std::optional<platform::Date> date);

    platform::Property<std::shared_ptr<VRXSchedulerActivityDelegate>> activityDelegate_;
};

}  // namespace vrx
