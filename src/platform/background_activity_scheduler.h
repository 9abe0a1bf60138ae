// Background activities: work that the system starts by itself, once, when its delay has passed and its conditions
// hold. They survive the process: the system starts a new one for an activity that is due.
#pragma once

#include <cstdint>
#include <functional>
#include <optional>
#include <string>
#include <string_view>
#include <utility>

#include "vrx/platform/task.h"

namespace vrx::platform {

// Activities that the system fires on its own, after the vendor prefix: at the first start of each version of the
// agent, and once a boot.
inline constexpr std::string_view upgradeActivityRemainder = ".vrxagent.upgrade";
inline constexpr std::string_view bootActivityRemainder = ".vrxagent.boot";

enum class BackgroundActivityResult {
    Finished = 1,  // the system forgets the activity
    Deferred = 2,  // the system runs it again later
};

// Runs an activity that fires, on a thread of the system's; it must answer once. May be called again after it has.
using ActivityHandler = std::function<void(OnceCallback<BackgroundActivityResult> completion)>;

struct ActivityCriteria {
    std::int64_t delay = 0;        // seconds from now before which it doesn't run
    std::int64_t gracePeriod = 0;  // seconds after these within which it should
    bool requiresNetwork = false;

    bool operator==(const ActivityCriteria&) const = default;
};

enum class QualityOfService { Default = 21, Background = 9 };

// What the system is told about an activity.
struct ActivityRegistration {
    std::string identifier;
    // The system holds the activity already, or fires it on its own: only the handler is attached to it. Otherwise the
    // activity is registered afresh, in place of an earlier one of that identifier, with the criteria.
    bool isPreregistered = false;
    bool repeats = false;
    QualityOfService qualityOfService = QualityOfService::Default;
    std::optional<ActivityCriteria> criteria{};
    // A run of the activity registers it for its next one. So that a rule that gives "at once" over and over is no hot
    // loop, that comes no sooner than activity_timing.h's minimum interval after the run.
    bool isByOwnRun = false;
};

// The system's registry of activities. Any thread may use it.
class BackgroundActivities {
public:
    virtual ~BackgroundActivities() = default;
    virtual void schedule(const ActivityRegistration& registration, ActivityHandler handler) = 0;
    // Whether an activity under way should stop and be deferred.
    virtual bool shouldDefer(std::string_view identifier) const = 0;
    // Makes the handler of an activity that an earlier process scheduled and this one has not checked in for, when it
    // falls due; a null handler leaves it alone. Before the first activity fires.
    virtual void setHandlerFactory(std::function<ActivityHandler(const std::string& identifier)> factory) = 0;
};

// One activity's side of the system's registry, under an identifier that is fixed. Its attributes belong to the thread
// that schedules.
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
