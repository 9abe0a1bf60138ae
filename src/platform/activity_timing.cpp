#include "vrx/platform/activity_timing.h"

#include <algorithm>
#include <iterator>

#include "vrx/platform/vendor.h"

namespace vrx::platform {

namespace {

constexpr Duration none{0.0};

Duration leftOnTheWall(const DueTime& due, const Moment& now) {
    return std::clamp<Duration>(due.wall - now.wall, none, due.wait);
}

}  // namespace

DueTime dueAfter(Duration wait, const Moment& now) {
    return {now.boot, now.sinceBoot + wait, now.wall + wait, wait};
}

Duration timeLeft(const DueTime& due, const Moment& now) {
    return due.boot == now.boot ? std::max(none, due.sinceBoot - now.sinceBoot) : leftOnTheWall(due, now);
}

DueTime noSoonerThan(const DueTime& due, Duration wait, const Moment& now) {
    return timeLeft(due, now) < wait ? dueAfter(wait, now) : due;
}

DueTime carriedOver(const DueTime& due, const Moment& now) {
    const bool isOfThisBoot = due.boot == now.boot;
    if (isOfThisBoot && !due.isCarriedOver) return due;
    Duration left = leftOnTheWall(due, now);
    // Setting the wall clock may bring a due time nearer, but never puts it off.
    if (isOfThisBoot) left = std::min(left, timeLeft(due, now));
    DueTime carried = due;
    carried.boot = now.boot;
    carried.sinceBoot = now.sinceBoot + left;
    carried.isCarriedOver = true;
    return carried;
}

DueTime takenUp(const DueTime& due, const DueTime& earlier, const Moment& now) {
    DueTime bound = due;
    bound.isCarriedOver = earlier.isCarriedOver || earlier.boot != now.boot;
    return bound;
}

DueTime dueTime(const ActivityCriteria& criteria, Duration interval, const Moment& now) {
    const Duration wait = Duration(static_cast<double>(std::max<std::int64_t>(criteria.delay, 0))) + firingMargin;
    return dueAfter(criteria.delay > 0 ? wait : std::max(wait, interval), now);
}

Duration retryDelay(int deferrals) {
    constexpr double seconds[] = {1, 60, 300, 600, 1200, 2400, 3600};
    const int last = static_cast<int>(std::size(seconds)) - 1;
    return Duration(seconds[std::clamp(deferrals - 1, 0, last)]);
}

bool waitsForBootActivity(std::string_view identifier) {
    return identifier != vendorIdentifier(bootActivityRemainder) &&
           identifier != vendorIdentifier(upgradeActivityRemainder);
}

FiringDecision decideFiring(const DueTime& due, const ActivityCriteria& criteria, const Moment& now,
                            bool isNetworkAvailable, bool shouldDefer) {
    if (const Duration left = timeLeft(due, now); left > none) return {.askAgainIn = left};
    if (criteria.requiresNetwork && !isNetworkAvailable) return {.isWaitingForNetwork = true};
    // The grace period is used only while the system asks for deferral.
    const Duration spent = due.boot == now.boot ? now.sinceBoot - due.sinceBoot : none;
    const Duration grace(static_cast<double>(criteria.gracePeriod));
    if (shouldDefer && spent < grace) return {.askAgainIn = grace - spent, .isHeldBack = true};
    return {.isFired = true};
}

}  // namespace vrx::platform
