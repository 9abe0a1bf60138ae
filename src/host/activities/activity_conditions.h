// What background activities depend on of the machine. The agent's is the machine itself; a test moves the clocks by
// hand.
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
    virtual bool shouldDefer() const = 0;
    virtual platform::Duration minimumInterval() const = 0;

    // Main thread. What is called, there too: at the time that was asked for, also when the network has changed; and
    // when the wall clock was set.
    struct Calls {
        std::function<void()> wake;
        std::function<void()> wallClockSet;
    };
    virtual void start(Calls calls) = 0;
    virtual bool isNetworkAvailable() = 0;
    // Replaces what was asked before. The time is on the boot clock; a wake-up is never early.
    virtual void wakeAt(std::optional<platform::Duration> sinceBoot, bool whenNetworkChanges) = 0;
};

}  // namespace vrx::host
