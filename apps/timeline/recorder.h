// Takes down what is shown, and which activities run, while somebody plays on a simulated host. The host does not
// notice: nothing is written, no scripted fault is used up. One thread, the simulation's.
#pragma once

#include <map>
#include <optional>
#include <string>
#include <vector>

#include "timeline/chronicle.h"
#include "vrx/platform/follow_up_controller.h"
#include "vrx/sim/host.h"

namespace vrx::timeline {

class Recorder {
public:
    // From the host's present moment on. The host must outlive the recorder and is observed by no other.
    explicit Recorder(sim::Host& host);
    ~Recorder();
    Recorder(const Recorder&) = delete;
    Recorder& operator=(const Recorder&) = delete;

    // To be called from the simulation's body, at the beginning and whenever devices, records or the items themselves
    // may have been changed by others than the agent. What the agent posts, clears and runs is seen by itself.
    void look();
    std::size_t runCount() const { return runCount_; }
    // When the last change came: an item appeared, changed or went, or an activity ran.
    platform::Date lastChange() const { return lastChange_; }

    // All so far. The assumptions, the last runs and the present moment are for the caller to fill in.
    Chronicle chronicle();

private:
    // An item as it was posted, for as long as nothing replaced it.
    struct Presence {
        platform::FollowUpItem item;
        platform::Date from{};
        platform::Duration clockAhead{};  // of the wall clock, when somebody has set it
        std::optional<platform::Date> until{};
    };

    // The time that has passed. The wall clock can be set in between.
    platform::Date moment() const { return begin_ + (host_.clock.elapsed() - elapsedAtBegin_); }
    void lookAtItems();
    void noteFiring(const std::string& identifier);
    DeviceLane& laneOf(const std::string& serialNumber);

    sim::Host& host_;
    const platform::Date begin_ = host_.clock.now();
    const platform::Duration elapsedAtBegin_ = host_.clock.elapsed();
    std::vector<DeviceLane> lanes_;
    std::vector<Presence> past_;     // in the order in which they ended
    std::vector<Presence> present_;  // in the order in which they began
    std::vector<ActivityLane> activities_;
    std::size_t runCount_ = 0;
    platform::Date lastChange_ = begin_;
};

}  // namespace vrx::timeline
