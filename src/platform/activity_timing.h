// When background activities fire: the rules that every registry of them follows, as pure functions of what was
// registered and of the present moment.
#pragma once

#include <optional>
#include <string>
#include <string_view>

#include "vrx/platform/background_activity_scheduler.h"
#include "vrx/platform/date.h"

namespace vrx::platform {

// The clocks at one moment.
struct Moment {
    std::string boot;      // which one it is: another after each
    Duration sinceBoot{};  // time asleep included
    Date wall{};
};

// A moment to come. A delay is elapsed time: within the boot that it began in, the boot clock tells its end, whatever
// is done to the wall clock. Over a boot only the wall clock tells.
struct DueTime {
    std::string boot;
    Duration sinceBoot{};
    Date wall{};
    Duration wait{};             // from its registration on: the most that can be left
    bool isCarriedOver = false;  // it was registered in an earlier boot

    bool operator==(const DueTime&) const = default;
};

DueTime dueAfter(Duration wait, const Moment& now);
// 0 when it is due.
Duration timeLeft(const DueTime& due, const Moment& now);
// That moment, or the one after the wait if that comes later.
DueTime noSoonerThan(const DueTime& due, Duration wait, const Moment& now);
// The same moment on the present boot's clock: to be asked at each start, and again whenever the wall clock was set,
// which can bring it nearer: a device may start with a clock that is wrong, and learn the time later.
DueTime carriedOver(const DueTime& due, const Moment& now);

// Delays arrive truncated to whole seconds: what fires this much later is never early.
inline constexpr Duration firingMargin{1.0};
// From an activity's run to the next one that it registers itself. An activity that asks for no delay over and over
// costs a run now and then, not a processor.
inline constexpr Duration minimumInterval{15.0 * 60};

// When a registration falls due. The interval is 0 for one that no run of the activity itself makes.
DueTime dueTime(const ActivityCriteria& criteria, Duration interval, const Moment& now);

// From an activity's result to the next attempt, after so many deferred results in a row: soon at first, hourly at
// last.
Duration retryDelay(int deferrals);

// Whether an activity is held until the boot activity, once a boot, has taken up what was scheduled before: all are but
// those that the system fires on its own.
bool waitsForBootActivity(std::string_view identifier);

// Whether an activity that is registered fires at a moment.
struct FiringDecision {
    bool isFired = false;
    std::optional<Duration> askAgainIn{};  // none: there is nothing but the network to wait for
    bool isWaitingForNetwork = false;
};
FiringDecision decideFiring(const DueTime& due, const ActivityCriteria& criteria, const Moment& now,
                            bool isNetworkAvailable, bool shouldDefer);

}  // namespace vrx::platform
