#include "vrxsim/wish.h"

#include <algorithm>
#include <cmath>

namespace vrx::simulation {

using platform::Date;
using platform::Duration;

std::optional<Date> offeredFrom(const Record& record) {
    if (record.shownFrom) return World::dateOf(*record.shownFrom);
    if (!record.until) return std::nullopt;
    return World::dateOf(*record.until - record.daysBeforeEnd.value_or(0));
}

std::optional<Wish> wishFor(const World& world, const std::string& serialNumber, bool isDismissed, Date moment) {
    const Record* const record = world.record(serialNumber);
    const bool isThere = serialNumber == phone || (world.isPaired(serialNumber) && world.areWatchesSupported());
    if (!isThere || isDismissed || !record || !record->isOffered || !record->until) return std::nullopt;
    if (world.hasCarrier(record->excludedCarrier)) return std::nullopt;
    const double left = (World::dateOf(*record->until) - moment).count() / secondsOfDay;
    if (left <= 0 || offeredFrom(*record) > moment) return std::nullopt;
    return Wish{static_cast<int>(std::ceil(left)), world.host.locale.identifier};
}

std::optional<Date> nextChangeOfWish(const World& world, const std::string& serialNumber, Date moment) {
    const Record* const record = world.record(serialNumber);
    if (!record || !record->until) return std::nullopt;
    const Date until = World::dateOf(*record->until);
    if (until <= moment) return std::nullopt;
    if (const Date from = *offeredFrom(*record); from > moment) return std::min(from, until);
    const double left = (until - moment).count() / secondsOfDay;
    return until - Duration((std::ceil(left) - 1) * secondsOfDay);
}

}  // namespace vrx::simulation
