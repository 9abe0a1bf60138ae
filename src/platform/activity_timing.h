// When a background activity fires. Every registry of activities follows these rules. They are pure functions of what
// was registered and of the present moment.
#pragma once

#include <optional>
#include <string>
#include <string_view>

#include "vrx/platform/background_activity_scheduler.h"
#include "vrx/platform/date.h"

namespace vrx::platform {

// The clocks at one moment.
struct Moment {
    std::string boot;      // identifies the boot
    Duration sinceBoot{};  // time asleep included
    Date wall{};
};

// A future moment. Within the boot in which a delay began, the boot clock tells when it ends, so setting the wall clock
// changes nothing. After another boot only the wall clock can tell.
struct DueTime {
    std::string boot;
    Duration sinceBoot{};
    Date wall{};
    Duration wait{};             // the whole delay; no more than that can be left
    bool isCarriedOver = false;  // it was registered in an earlier boot, or in the place of such a one

    bool operator==(const DueTime&) const = default;
};

DueTime dueAfter(Duration wait, const Moment& now);
// The time until it is due; 0 once it is.
Duration timeLeft(const DueTime& due, const Moment& now);
// The later of the due time and the end of a wait that begins now.
DueTime noSoonerThan(const DueTime& due, Duration wait, const Moment& now);
// The due time as the present boot's clock shows it. Call this at each start, and again whenever the wall clock was
// set: a device may start with a wrong clock and learn the time later, which can bring the due time nearer.
DueTime carriedOver(const DueTime& due, const Moment& now);

// The due time of what the boot activity registers anew. What was registered in an earlier boot stays bound to the wall
// clock, which may be wrong at the boot.
DueTime takenUp(const DueTime& due, const DueTime& earlier, const Moment& now);

// Delays are truncated to whole seconds. An activity fires this much later, so that it is never early.
inline constexpr Duration firingMargin{1.0};
// The least time between a run of an activity and the next run that it registers itself with no delay. An activity that
// keeps asking for none costs a run now and then instead of a whole processor.
inline constexpr Duration minimumInterval{15.0 * 60};

// When a registration falls due. The interval is minimumInterval if a run of the activity itself registers it, else 0;
// it counts for a registration with no delay only.
DueTime dueTime(const ActivityCriteria& criteria, Duration interval, const Moment& now);

// The time from a deferred result to the next attempt, by the number of deferred results in a row: a second at first,
// an hour in the end.
Duration retryDelay(int deferrals);

// Whether an activity waits, after each boot, until the boot activity has taken up what was scheduled before. All do,
// except those that the system fires on its own.
bool waitsForBootActivity(std::string_view identifier);

// Whether a registered activity fires now and, if not, what it waits for.
struct FiringDecision {
    bool isFired = false;
    std::optional<Duration> askAgainIn{};  // null when it fires, and while it waits for the network alone
    bool isWaitingForNetwork = false;
    bool isHeldBack = false;  // by the system's asking for deferral
};
FiringDecision decideFiring(const DueTime& due, const ActivityCriteria& criteria, const Moment& now,
                            bool isNetworkAvailable, bool shouldDefer);

}  // namespace vrx::platform
