#include "vrx/host/activities/background_activities.h"

#include <algorithm>
#include <utility>

#include "vrx/host/base/lock_wait.h"
#include "vrx/host/home/stored_facts.h"
#include "vrx/platform/log.h"
#include "vrx/platform/vendor.h"

namespace vrx::host {

using platform::ActivityHandler;
using platform::BackgroundActivityResult;
using platform::Duration;
using platform::Error;
using platform::FiringDecision;
using platform::Level;
using platform::log;
using platform::MaybeError;
using platform::Moment;

namespace {

void carryOverAll(ActivityRegistry& registry, const Moment& now) {
    for (const ScheduledActivity& activity : registry.scheduled()) {
        const platform::DueTime due = carriedOver(activity.due, now);
        if (due != activity.due) registry.postpone(activity.generation, due, activity.deferrals);
    }
}

// Schedules interrupted runs again. One that has registered a successor is left to it. The delay grows with each
// interruption, in case the run itself is what ends the process.
void resumeInterrupted(ActivityRegistry& registry, const std::set<std::string, std::less<>>& running,
                       const Moment& now) {
    for (const ActivityRun& run : registry.runs()) {
        if (run.ended || running.contains(run.identifier)) continue;
        log(Level::Default, "Activity %@ was interrupted", run.identifier);
        registry.endRun(run.identifier, RunOutcome::Interrupted, now.wall);
        const std::optional<ScheduledActivity> activity = registry.scheduled(run.identifier);
        if (!activity || activity->generation != run.generation) continue;
        const int deferrals = activity->deferrals + 1;
        registry.postpone(activity->generation, dueAfter(platform::retryDelay(deferrals), now), deferrals);
    }
}

// Schedules what the system fires on its own, in the same transaction as the fact that it did, so that a crash loses
// neither.
void scheduleOwn(Connection& connection, const std::string& agentVersion, const Moment& now) {
    const struct {
        std::string_view fact;
        const std::string& value;
        std::string_view activity;
    } occasions[] = {{stored_facts::agentVersion, agentVersion, platform::upgradeActivityRemainder},
                     {stored_facts::boot, now.boot, platform::bootActivityRemainder}};
    for (const auto& [fact, value, activity] : occasions) {
        if (storedFact(connection, fact) == value) continue;
        setStoredFact(connection, fact, value);
        ActivityRegistry(connection).schedule(platform::vendorIdentifier(activity), {}, dueAfter(Duration(0), now));
    }
}

}  // namespace

void BackgroundActivities::start(std::string agentVersion) {
    agentVersion_ = std::move(agentVersion);
    isStarted_ = true;
    around_.conditions.start({.wake = [this] { reconsider(); }, .wallClockSet = [this] { carryOver(); }});
    reconsider();
}

// The handler is in place before the row, so that a row that is due finds it.
void BackgroundActivities::schedule(const platform::ActivityRegistration& registration, ActivityHandler handler) {
    const std::string& identifier = registration.identifier;
    const platform::ActivityCriteria criteria = registration.criteria.value_or(platform::ActivityCriteria{});
    {
        std::lock_guard lock(mutex_);
        handlers_[identifier].swap(handler);  // the old one is destroyed outside the lock: it may own what calls here
        if (!registration.isPreregistered) {
            registeredByOwnRun_.erase(identifier);
            if (registration.isByOwnRun && criteria.delay <= 0 && running_.contains(identifier))
                registeredByOwnRun_.insert(identifier);
        }
    }
    if (!registration.isPreregistered) {
        const Duration interval = registration.isByOwnRun ? around_.conditions.minimumInterval() : Duration(0);
        const Moment now = around_.conditions.now();
        const platform::DueTime due = dueTime(criteria, interval, now);
        const bool isAfterBoot = isRunning(platform::vendorIdentifier(platform::bootActivityRemainder));
        store([identifier, criteria, due, isAfterBoot, now](Connection& connection) {
            ActivityRegistry registry(connection);
            const std::optional<ScheduledActivity> earlier = registry.scheduled(identifier);
            registry.schedule(identifier, criteria, isAfterBoot && earlier ? takenUp(due, earlier->due, now) : due);
        });
    }
    around_.mainLoop.post([this] { reconsider(); });
}

bool BackgroundActivities::shouldDefer(std::string_view identifier) const {
    bool needsNetwork = false;
    {
        std::lock_guard lock(mutex_);
        needsNetwork = needingNetwork_.contains(identifier);
    }
    return around_.conditions.shouldDefer(needsNetwork);
}

void BackgroundActivities::setHandlerFactory(std::function<ActivityHandler(const std::string&)> factory) {
    {
        std::lock_guard lock(mutex_);
        factory_.swap(factory);
    }
    around_.mainLoop.post([this] { reconsider(); });
}

void BackgroundActivities::reconsider() {
    if (!isStarted_ || isAbandoned_) return;
    if (takeUpIfReplaced() && answerRequests() && fireDue())
        failures_ = 0;
    else
        around_.conditions.wakeAt(around_.conditions.now().sinceBoot + nextRetry(), {});
}

void BackgroundActivities::abandon() {
    isAbandoned_ = true;
    platform::WorkInFlight released;
    std::lock_guard lock(unsavedMutex_);
    unsaved_.clear();
    released.swap(unsavedWork_);
}

void BackgroundActivities::carryOver() {
    store([now = around_.conditions.now()](Connection& connection) {
        ActivityRegistry registry(connection);
        carryOverAll(registry, now);
    });
    reconsider();
}

// Logs the first of several failures. Returns false.
bool BackgroundActivities::failed(const Error& error) {
    isBusy_ = error.code == SQLITE_BUSY;
    constexpr int quietFailures = 6;  // another process may be writing for a moment
    if (isBusy_ && failures_ < quietFailures) return false;
    if (!isFailing_.exchange(true))
        log(Level::Error, "No background activity is fired until this works: %@", error.text);
    return false;
}

bool BackgroundActivities::write(const Change& change) {
    if (const MaybeError error = around_.database.write(change)) return failed(*error);
    isFailing_ = false;
    return true;
}

// After a second at first, or sooner while another process writes, then after twice the time, up to a minute.
Duration BackgroundActivities::nextRetry() {
    constexpr int doublings = 12;
    const int failures = std::min(failures_++, doublings);
    return std::min(Duration(isBusy_ ? 0.02 : 1.0) * (1 << failures), Duration(60.0));
}

// Stores the change after the earlier ones. Returns false when it is kept for later.
bool BackgroundActivities::store(Change change) {
    {
        std::lock_guard lock(unsavedMutex_);
        unsaved_.push_back(std::move(change));
    }
    return storeUnsaved();
}

// One thread at a time, so that changes are stored in their order. The main loop's does not wait for one that waits for
// the file, but tries again later.
bool BackgroundActivities::storeUnsaved() {
    const auto storing = LockWait::take(storing_);
    std::vector<Change> changes;
    platform::WorkInFlight work;
    {
        std::lock_guard lock(unsavedMutex_);
        if (isAbandoned_) unsaved_.clear();
        if (unsaved_.empty()) return true;
        changes = unsaved_;
        if (!unsavedWork_) unsavedWork_ = around_.lifecycle.beginWork();
    }
    const bool isStored = storing && write([&](Connection& connection) {
                              for (const Change& change : changes) change(connection);
                          });
    if (!isStored) return false;
    std::lock_guard lock(unsavedMutex_);
    if (isAbandoned_) return true;
    unsaved_.erase(unsaved_.begin(), unsaved_.begin() + static_cast<std::ptrdiff_t>(changes.size()));
    if (unsaved_.empty()) work.swap(unsavedWork_);
    return true;
}

bool BackgroundActivities::hasUnsaved() {
    std::lock_guard lock(unsavedMutex_);
    return !unsaved_.empty();
}

// Takes the registry up at the start, and again when the file was replaced: carries due times over to this boot, and
// schedules interrupted and own activities.
bool BackgroundActivities::takeUpIfReplaced() {
    if (hasUnsaved() && !storeUnsaved()) return false;
    std::uint64_t opening = 0;
    const MaybeError error =
        around_.database.peek([&](Connection&, const Database::Stamp& stamp) { opening = stamp.opening; });
    if (error) return failed(*error);
    if (std::exchange(takenUp_, opening) == opening) return true;
    std::set<std::string, std::less<>> running;
    {
        std::lock_guard lock(mutex_);
        running = running_;
    }
    return store([running, version = agentVersion_, now = around_.conditions.now()](Connection& connection) {
        ActivityRegistry registry(connection);
        carryOverAll(registry, now);
        resumeInterrupted(registry, running, now);
        scheduleOwn(connection, version, now);
        dropRequests(connection);
    });
}

// Fires what is due, and has itself woken for the next one. Returns false when the database cannot be used.
bool BackgroundActivities::fireDue() {
    ActivityConditions& conditions = around_.conditions;
    std::vector<ScheduledActivity> activities;
    const MaybeError error =
        around_.database.read([&](Connection& connection) { activities = ActivityRegistry(connection).scheduled(); });
    if (error) return failed(*error);

    // The boot activity comes first, so that it is running when those that wait for it are considered.
    std::stable_partition(activities.begin(), activities.end(), [](const ScheduledActivity& activity) {
        return !platform::waitsForBootActivity(activity.identifier);
    });
    const std::string boot = platform::vendorIdentifier(platform::bootActivityRemainder);

    const Moment now = conditions.now();
    std::optional<Duration> next;
    ActivityConditions::Watched watched;
    for (const ScheduledActivity& activity : activities) {
        const bool isHeld = isRunning(boot) && platform::waitsForBootActivity(activity.identifier);
        if (isHeld || isRunning(activity.identifier)) continue;  // reconsidered at the end of that run
        const bool isDue = timeLeft(activity.due, now) == Duration(0);
        const FiringDecision decision = decideFiring(
            activity.due, activity.criteria, now,
            isDue && activity.criteria.requiresNetwork && conditions.isNetworkAvailable(),
            isDue && activity.criteria.gracePeriod > 0 && conditions.shouldDefer(activity.criteria.requiresNetwork));
        watched.network |= decision.isWaitingForNetwork;
        watched.deferral |= decision.isHeldBack;
        if (decision.askAgainIn) next = std::min(next.value_or(*decision.askAgainIn), *decision.askAgainIn);
        if (!decision.isFired) continue;
        const ActivityHandler handler = handlerFor(activity.identifier);
        if (handler && !fire(activity, handler)) return false;
    }
    conditions.wakeAt(next ? std::optional(now.sinceBoot + *next) : std::nullopt, watched);
    return true;
}

bool BackgroundActivities::answerRequests() {
    std::vector<FiringRequest> requests;
    const MaybeError error =
        around_.database.read([&](Connection& connection) { requests = openRequests(connection); });
    if (error) return failed(*error);
    for (const FiringRequest& request : requests) {
        const FiringAnswer answer = fireRequested(request.identifier);
        if (answer == FiringAnswer::NotStored && isBusy_) return false;
        if (!store([number = request.number, answer](Connection& connection) {
                answerRequest(connection, number, answer);
            }))
            return false;
    }
    return true;
}

// Fires as if it were due and its conditions held. It keeps its due time, in case the result is "deferred".
FiringAnswer BackgroundActivities::fireRequested(const std::string& identifier) {
    if (isRunning(identifier)) return FiringAnswer::AlreadyRunning;
    const ActivityHandler handler = handlerFor(identifier);
    if (!handler) return FiringAnswer::Unknown;
    std::optional<ScheduledActivity> activity;
    const bool isFound = write([&](Connection& connection) {
        ActivityRegistry registry(connection);
        if (!registry.scheduled(identifier))
            registry.schedule(identifier, {}, dueAfter(Duration(0), around_.conditions.now()));
        activity = registry.scheduled(identifier);
    });
    return isFound && fire(*activity, handler) ? FiringAnswer::Fired : FiringAnswer::NotStored;
}

// Stores the beginning of the run, then runs the handler. Returns false when the beginning could not be stored.
bool BackgroundActivities::fire(const ScheduledActivity& activity, const ActivityHandler& handler) {
    const Run run{activity.identifier, activity.generation};
    bool isPresent = false;
    const bool isStored = write([&](Connection& connection) {
        ActivityRegistry registry(connection);
        const std::optional<ScheduledActivity> present = registry.scheduled(run.identifier);
        isPresent = present && present->generation == run.generation;
        if (isPresent) registry.beginRun(run.identifier, run.generation, around_.conditions.now().wall);
    });
    if (!isStored) return false;
    if (!isPresent) return true;  // registered anew meanwhile: reconsidered by itself
    {
        std::lock_guard lock(mutex_);
        running_.insert(run.identifier);
        if (activity.criteria.requiresNetwork) needingNetwork_.insert(run.identifier);
    }
    platform::OnceCallback<BackgroundActivityResult> completion =
        [this, run, work = around_.lifecycle.beginWork()](BackgroundActivityResult result) { end(run, result); };
    around_.workers.post([handler, completion = std::move(completion)]() mutable { handler(std::move(completion)); });
    return true;
}

// Stores the end of the run before it counts as ended, so that it cannot fire again in between.
void BackgroundActivities::end(const Run& run, BackgroundActivityResult result) {
    const bool isFinished = result == BackgroundActivityResult::Finished;
    Duration interval{0};
    {
        std::lock_guard lock(mutex_);
        if (registeredByOwnRun_.erase(run.identifier) > 0) interval = around_.conditions.minimumInterval();
    }
    store([run, isFinished, interval, now = around_.conditions.now()](Connection& connection) {
        ActivityRegistry registry(connection);
        registry.endRun(run.identifier, isFinished ? RunOutcome::Finished : RunOutcome::Deferred, now.wall);
        const std::optional<ScheduledActivity> activity = registry.scheduled(run.identifier);
        if (!activity) return;
        if (activity->generation != run.generation)  // registered during the run
            return registry.postpone(activity->generation, noSoonerThan(activity->due, interval, now), 0);
        if (isFinished) return registry.remove(run.generation);
        const int deferrals = activity->deferrals + 1;
        registry.postpone(run.generation, noSoonerThan(activity->due, platform::retryDelay(deferrals), now), deferrals);
    });
    {
        std::lock_guard lock(mutex_);
        running_.erase(run.identifier);
        needingNetwork_.erase(run.identifier);
    }
    around_.mainLoop.post([this] { reconsider(); });
}

// An activity of an earlier process for which this one has no handler gets one from the factory.
ActivityHandler BackgroundActivities::handlerFor(const std::string& identifier) {
    std::function<ActivityHandler(const std::string&)> factory;
    {
        std::lock_guard lock(mutex_);
        auto handler = handlers_.find(identifier);
        if (handler != handlers_.end()) return handler->second;
        factory = factory_;
    }
    return factory ? factory(identifier) : nullptr;
}

bool BackgroundActivities::isRunning(const std::string& identifier) const {
    std::lock_guard lock(mutex_);
    return running_.contains(identifier);
}

}  // namespace vrx::host
