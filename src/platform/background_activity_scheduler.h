// Background activities: work that the system starts by itself, once, when its delay has passed and its conditions
// hold. They outlive the process: the system starts a new process for an activity that is due.
#pragma once

#include <cstdint>
#include <functional>
#include <optional>
#include <string>
#include <string_view>
#include <utility>

#include "vrx/platform/task.h"

namespace vrx::platform {

// Identifiers, after the vendor prefix, of the activities that the system fires on its own: the upgrade activity at the
// first start of each version of the agent, the boot activity once a boot.
inline constexpr std::string_view upgradeActivityRemainder = ".vrxagent.upgrade";
inline constexpr std::string_view bootActivityRemainder = ".vrxagent.boot";

enum class BackgroundActivityResult {
    Finished = 1,  // the system forgets the activity
    Deferred = 2,  // the system runs it again later
};

// Runs an activity that fires, on one of the system's threads. It must call the completion once; after that it may be
// called again.
using ActivityHandler = std::function<void(OnceCallback<BackgroundActivityResult> completion)>;

struct ActivityCriteria {
    std::int64_t delay = 0;        // in seconds from now; the activity does not run earlier
    std::int64_t gracePeriod = 0;  // in seconds after the delay; the activity should run within it
    bool requiresNetwork = false;

    bool operator==(const ActivityCriteria&) const = default;
};

enum class QualityOfService { Default = 21, Background = 9 };

// What the system is told about an activity.
struct ActivityRegistration {
    std::string identifier;
    // The system already holds the activity, or fires it on its own, so that only the handler is attached. Otherwise
    // the activity is registered afresh with the criteria, and replaces an earlier one of the same identifier.
    bool isPreregistered = false;
    bool repeats = false;
    QualityOfService qualityOfService = QualityOfService::Default;
    std::optional<ActivityCriteria> criteria{};
    // A run of the activity registers it for its next run. With no delay the next run comes no sooner than
    // minimumInterval (activity_timing.h) after this one, so that a rule which keeps answering "at once" does not
    // become a busy loop.
    bool isByOwnRun = false;
};

// The system's registry of activities. Any thread may use it.
class BackgroundActivities {
public:
    virtual ~BackgroundActivities() = default;
    virtual void schedule(const ActivityRegistration& registration, ActivityHandler handler) = 0;
    // Whether an activity under way should stop and be deferred.
    virtual bool shouldDefer(std::string_view identifier) const = 0;
    // Sets the factory of handlers for activities that are due but have no handler yet, because an earlier process
    // scheduled them. A null handler leaves the activity alone. Call this before the first activity fires.
    virtual void setHandlerFactory(std::function<ActivityHandler(const std::string& identifier)> factory) = 0;
};

// One activity's access to the system's registry, under a fixed identifier. Only the thread that schedules may set the
// attributes.
class BackgroundActivityScheduler {
public:
    explicit BackgroundActivityScheduler(std::string identifier) { registration_.identifier = std::move(identifier); }
    BackgroundActivityScheduler(const BackgroundActivityScheduler&) = delete;
    BackgroundActivityScheduler& operator=(const BackgroundActivityScheduler&) = delete;

    const std::string& identifier() const { return registration_.identifier; }
    void setPreregistered(bool isPreregistered) { registration_.isPreregistered = isPreregistered; }
    void setRepeats(bool repeats) { registration_.repeats = repeats; }
    void setRegisteredByOwnRun(bool isByOwnRun) { registration_.isByOwnRun = isByOwnRun; }
    void setQualityOfService(QualityOfService quality) { registration_.qualityOfService = quality; }
    void setAdditionalActivityCriteria(const ActivityCriteria& criteria) { registration_.criteria = criteria; }
    // Hands the activity to the system as the attributes say; the system keeps the handler.
    void scheduleWithHandler(ActivityHandler handler);
    bool shouldDefer() const;

protected:
    ~BackgroundActivityScheduler() = default;

private:
    ActivityRegistration registration_;
};

}  // namespace vrx::platform
