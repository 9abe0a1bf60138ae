#include "vrx/scheduling/start_up_activities.h"

#include <utility>

#include "vrx/platform/clock.h"
#include "vrx/platform/defaults_store.h"
#include "vrx/platform/log.h"
#include "vrx/platform/platform.h"
#include "vrx/platform/settings_keys.h"
#include "vrx/platform/vendor.h"
#include "vrx/scheduling/follow_up_refresh.h"
#include "vrx/scheduling/outreach_activity.h"
#include "vrx/scheduling/scheduler.h"

namespace vrx {

using platform::BackgroundActivityResult;
using platform::DefaultsStore;
using platform::Duration;
using platform::Level;
using platform::Platform;

namespace {

constexpr std::string_view upgradeCompletedKey = "PostUpgradeActivityCompleted";

bool isUpgradeCompleted() {
    return Platform::current().defaultsStore().boolean(upgradeCompletedKey);
}

void rescheduleIfNotComplete(std::shared_ptr<VRXSchedulerActivityDelegate> activity) {
    auto scheduler = VRXScheduler::newSchedulerWithActivityDelegate(std::move(activity));
    std::optional<platform::Date> date = scheduler->scheduledActivityDate();
    if (!date) return;
    log(Level::Default, "'%@' not complete, rescheduling", scheduler->identifier());
    scheduler->scheduleActivityForDate(date);
}

}  // namespace

std::string VRXPostUpgradeActivity::identifier() const {
    return platform::vendorIdentifier(platform::upgradeActivityRemainder);
}

void VRXPostUpgradeActivity::performActivityForScheduler(const std::shared_ptr<VRXScheduler>& /*scheduler*/,
                                                         CompletionHandler completionHandler) {
    if (isUpgradeCompleted()) {
        log(Level::Default, "post upgrade activity already performed");
    } else {
        log(Level::Default, "post upgrade activity hasn't yet been performed, perform upgrade activity");
        performUpgrade();
    }
    completionHandler(BackgroundActivityResult::Finished);
}

// The flag comes last, so that work which a crash cut short is done again from the beginning.
void VRXPostUpgradeActivity::performUpgrade() const {
    DefaultsStore& defaults = Platform::current().defaultsStore();
    VRXScheduler::clearScheduledActivities();
    defaults.set(platform::settings::defaultDeviceActivationDate, Platform::current().clock().now());
    VRXScheduler::newSchedulerWithActivityDelegate(std::make_shared<VRXOutreachActivity>(collaborators_))
        ->scheduleActivityWithDelay(Duration(defaults.number(platform::settings::postUpgradeOutreachDelay)));
    defaults.set(upgradeCompletedKey, true);
}

std::string VRXPostBootActivity::identifier() const {
    return platform::vendorIdentifier(platform::bootActivityRemainder);
}

void VRXPostBootActivity::performActivityForScheduler(const std::shared_ptr<VRXScheduler>& /*scheduler*/,
                                                      CompletionHandler completionHandler) {
    if (isUpgradeCompleted()) {
        rescheduleIfNotComplete(std::make_shared<VRXOutreachActivity>(collaborators_));
        rescheduleIfNotComplete(std::make_shared<VRXFollowUpRefresh>(collaborators_));
    } else {
        log(Level::Default, "post upgrade activity hasn't yet been performed, skip boot activity");
    }
    completionHandler(BackgroundActivityResult::Finished);
}

}  // namespace vrx
