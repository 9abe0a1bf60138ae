// Virtual time. It passes only when the queues run work that is due later.
#pragma once

#include <algorithm>

#include "vrx/platform/clock.h"

namespace vrx::sim {

class Clock final : public platform::Clock {
public:
    static constexpr platform::Date start = platform::dateFromEpoch(1'769'860'800);  // 2026-01-31 12:00:00 UTC

    platform::Date now() const override { return start_ + elapsed_; }
    std::chrono::seconds timeZoneOffset() const override { return timeZoneOffset_; }

    // Sets the wall clock, as a user may. Work that waits for its time still waits as long as before.
    void set(platform::Date now) { start_ = now - elapsed_; }
    void setTimeZoneOffset(std::chrono::seconds offset) { timeZoneOffset_ = offset; }

    // The time since the simulation began, whatever the wall clock says.
    platform::Duration elapsed() const { return elapsed_; }
    platform::Duration elapsedAt(platform::Date date) const { return date - start_; }
    // For the queues. Time never goes back.
    void advanceTo(platform::Duration elapsed) { elapsed_ = std::max(elapsed_, elapsed); }

private:
    platform::Date start_ = start;
    platform::Duration elapsed_{0};
    std::chrono::seconds timeZoneOffset_{0};
};

}  // namespace vrx::sim
