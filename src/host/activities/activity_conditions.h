// What background activities depend on in the machine. Tests replace it to move the clocks by hand.
#pragma once

#include <functional>
#include <optional>

#include "vrx/platform/activity_timing.h"

namespace vrx::host {

class ActivityConditions {
public:
    virtual ~ActivityConditions() = default;

    // Any thread.
    virtual platform::Moment now() const = 0;
    virtual bool shouldDefer(bool needsNetwork) const = 0;
    virtual platform::Duration minimumInterval() const = 0;

    // Main thread, for the calls as well: wake at the requested time or when what is watched has changed, wallClockSet
    // when somebody set the wall clock.
    struct Calls {
        std::function<void()> wake;
        std::function<void()> wallClockSet;
    };
    virtual void start(Calls calls) = 0;
    virtual bool isNetworkAvailable() = 0;
    struct Watched {
        bool network = false;   // whether there is one
        bool deferral = false;  // whether to defer
    };
    // Replaces the earlier request. The time is on the boot clock; a wake-up is never early.
    virtual void wakeAt(std::optional<platform::Duration> sinceBoot, Watched watched) = 0;
};

}  // namespace vrx::host
