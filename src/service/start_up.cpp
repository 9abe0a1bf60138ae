#include "vrx/service/start_up.h"

#include <string>
#include <utility>

#include "vrx/devices/locale_monitor.h"
#include "vrx/devices/paired_devices_monitor.h"
#include "vrx/followup/follow_up.h"
#include "vrx/platform/log.h"
#include "vrx/platform/platform.h"
#include "vrx/platform/vendor.h"
#include "vrx/scheduling/follow_up_post.h"
#include "vrx/scheduling/follow_up_refresh.h"
#include "vrx/scheduling/outreach_activity.h"
#include "vrx/scheduling/scheduler.h"
#include "vrx/scheduling/start_up_activities.h"
#include "vrx/service/agent.h"
#include "vrx/service/register_defaults.h"
#include "vrx/support/orvane_support_manager.h"

namespace vrx {

using platform::Platform;

namespace {

std::string settingsApp() {
    return platform::vendorIdentifier(platform::settingsAppRemainder);
}

std::shared_ptr<VRXFollowUpManaging> makeFollowUp() {
    return std::make_shared<VRXFollowUp>();
}

template <class Activity>
std::shared_ptr<VRXScheduler> newScheduler(const ActivityCollaborators& collaborators) {
    return VRXScheduler::newSchedulerWithActivityDelegate(std::make_shared<Activity>(collaborators));
}

template <class Activity>
std::shared_ptr<VRXScheduler> monitored(const ActivityCollaborators& collaborators) {
    auto scheduler = newScheduler<Activity>(collaborators);
    scheduler->monitorForScheduledActivity();
    return scheduler;
}

AgentCollaborators agentCollaborators(const ActivityCollaborators& activities) {
    return {.makeFollowUp = makeFollowUp,
            .scheduleOutreach =
                [activities](platform::Duration delay) {
                    newScheduler<VRXOutreachActivity>(activities)->scheduleActivityWithDelay(delay);
                },
            .makeSupportManager = [] { return std::make_shared<VRXOrvaneSupportManager>(); }};
}

// For the agents of activities, which make activities in turn. There are no such agents once start-up's objects are
// gone.
ActivityCollaborators activityCollaborators(const std::shared_ptr<void>& lifetime) {
    ActivityCollaborators collaborators{.makeAgent = nullptr, .makeFollowUp = makeFollowUp};
    collaborators.makeAgent = [lifetime = std::weak_ptr(lifetime)]() -> std::shared_ptr<VRXAgentProtocol> {
        auto alive = lifetime.lock();
        if (!alive) return nullptr;
        return VRXAgent::initWithCallingProcessBundleID(settingsApp(),
                                                        agentCollaborators(activityCollaborators(alive)));
    };
    return collaborators;
}

}  // namespace

StartUp::StartUp()
    : activityCollaborators_(activityCollaborators(lifetime_)),
      agentCollaborators_(agentCollaborators(activityCollaborators_)) {
    // The order matters: defaults before anything reads them, the migration before monitors and clients use its data,
    // the listener last.
    log(platform::Level::Default, "launched");
    vrx_registerDefaults(Platform::current().defaultsStore());
    monitorActivities();
    agent_ = VRXAgent::initWithCallingProcessBundleID(settingsApp(), agentCollaborators_);
    agent_->performMigrationIfNeeded();
    startMonitors();
    openListener();
}

StartUp::~StartUp() = default;

// The follow-up post is not monitored: it is scheduled when it is needed, and one that an earlier process scheduled
// gets its handler when it falls due.
void StartUp::monitorActivities() {
    Platform::current().backgroundActivities().setHandlerFactory(
        [collaborators = activityCollaborators_](const std::string& identifier) -> platform::ActivityHandler {
            auto scheduler = newScheduler<VRXFollowUpPost>(collaborators);
            return scheduler->identifier() == identifier ? scheduler->firingHandler() : nullptr;
        });
    schedulers_ = {monitored<VRXPostUpgradeActivity>(activityCollaborators_),
                   monitored<VRXPostBootActivity>(activityCollaborators_),
                   monitored<VRXOutreachActivity>(activityCollaborators_),
                   monitored<VRXFollowUpRefresh>(activityCollaborators_)};
}

void StartUp::startMonitors() {
    localeMonitor_ = VRXLocaleMonitor::initWithAgent(agent_, makeFollowUp);
    localeMonitor_->start();
    pairedDevicesMonitor_ = VRXPairedDevicesMonitor::initWithAgent(
        agent_, {.nextDate = VRXFollowUpPost::nextFollowUpPostDateWithDevicesInfo,
                 .schedule = [collaborators = activityCollaborators_](platform::Date date) {
                     newScheduler<VRXFollowUpPost>(collaborators)->scheduleActivityForDate(date);
                 }});
    pairedDevicesMonitor_->start();
}

void StartUp::openListener() {
    delegate_.emplace(agentCollaborators_);
    listener_ = Platform::current().serviceListenerFactory().makeListener(
        platform::vendorIdentifier(platform::serviceNameRemainder));
    listener_->setDelegate(&*delegate_);
    listener_->resume();
}

}  // namespace vrx
