// What should be shown, by what the world is now and nothing else: an item for each device that is there, whose offer
// the server makes now, on a carrier that it is made on, and which the user has not dismissed; with the days that are
// left and in the user's language. It knows nothing of how the agent could come to know.
#pragma once

#include <optional>
#include <string>

#include "vrxsim/world.h"

namespace vrx::simulation {

struct Wish {
    int days = 0;  // until the offer ends, of which the last one counts whole
    std::string language{};
};

// Null when no item should be shown at the moment of the wall clock.
std::optional<Wish> wishFor(const World& world, const std::string& serialNumber, bool isDismissed,
                            platform::Date moment);

// The first day of an offer on the wall clock; null for one that has no such day.
std::optional<platform::Date> offeredFrom(const Record& record);
// The first of the moments after this one at which the wish for a device changes by itself; null for none.
std::optional<platform::Date> nextChangeOfWish(const World& world, const std::string& serialNumber,
                                               platform::Date moment);

}  // namespace vrx::simulation
