// What comes between the agent and the simulated host: a notice before each call of a facility that keeps or fetches
// something, and a defect planted in the host itself. Without either, nothing happens.
#pragma once

#include <cstdint>
#include <functional>

namespace vrx::sim {

// Faults of the host, each of which breaks a promise that a facility gives. None is a fault of the agent.
enum class Defect : std::uint8_t {
    None,
    SettingLost,       // a write is acknowledged and lost
    SettingStale,      // a setting reads as it was before the last write of any
    SettingForgotten,  // the last write is gone after the end of the process
    PostLost,          // an item is acknowledged and not kept
    ClearLost,         // a clear is acknowledged and clears nothing
    ItemDoubled,       // a post in the place of a pending item leaves that one as well
    FileTorn,          // half of a file's content is kept
    FiringLost,        // an activity is forgotten when it is due
    FiringLate,        // an activity is due a day late
    FiringEarly,       // an activity is due when half its delay has passed
    FiringAgain,       // a finished activity is not forgotten, and is due again at once, each time
    HandlerTwice,      // a firing calls the handler twice
    RowForgotten,      // a boot forgets an activity
    ClockNotCarried,   // a boot counts delays anew from its own beginning
    ReplyDropped,      // a request never reaches the agent
    AnswerLost,        // neither an answer of a server nor its absence is ever told
    NotificationLost,  // a notification reaches nobody
};

class Interference {
public:
    // Called on the task that calls a facility. It may suspend the task for good, or throw.
    std::function<void()> beforeCall;
    Defect planted = Defect::None;

    void call() const {
        if (beforeCall) beforeCall();
    }
    // Whether the defect shows now: at every third occasion, if it is the planted one.
    bool strikes(Defect defect) const { return planted == defect && ++occasions_ % 3 == 0; }

private:
    mutable unsigned occasions_ = 0;
};

}  // namespace vrx::sim
