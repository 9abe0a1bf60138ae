// Binds an activity to the system's background activities and adds a target date. The date is kept in the settings and
// so outlives the process. A firing before the target date is deferred and changes nothing; a firing at or after it, or
// without one, runs the activity. The system keeps the scheduler alive, through the handler, until another scheduler
// takes the identifier. Only one thread may schedule; everything else any thread may do.
// A leading "_" is spelled so on purpose; "Names" in docs/architecture.md says why.
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

    // Makes a scheduler for the activity, under its identifier. It schedules nothing yet.
    static std::shared_ptr<VRXScheduler> newSchedulerWithActivityDelegate(
        std::shared_ptr<VRXSchedulerActivityDelegate> activityDelegate);
    // Removes the target dates of all activities.
    static void clearScheduledActivities();

    // Attaches a handler to an activity that the system already holds or fires by itself; criteria and target date
    // stay.
    void monitorForScheduledActivity();
    // Both set the target date and register the activity afresh. A null date means now, and removes the target date.
    void scheduleActivityWithDelay(platform::Duration delay);
    void scheduleActivityForDate(std::optional<platform::Date> date);

    std::optional<platform::Date> scheduledActivityDate() const;
    // The key of the setting that holds an activity's target date.
    static std::string targetDateKey(const std::string& identifier);

    // Handles a firing of the activity. The block is the system's completion handler. It gets the result on the main
    // queue, a second after the activity has given it.
    void performScheduledOutreachWithBlock(CompletionHandler block);
    // A handler that does so at each firing and keeps the scheduler alive.
    platform::ActivityHandler firingHandler();

    // Read and replaced whole, from any thread.
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
