// The agent of a home played forward from the present moment on, on a simulated host that has the home's state. The
// agent that runs, and the home, are left alone. One play at a time; while it lives, the simulated host is the current
// platform.
#pragma once

#include <memory>
#include <set>
#include <string>
#include <vector>

#include "timeline/recorder.h"
#include "vrx/sim/host.h"
#include "vrxhost/agent_activities.h"
#include "vrxhost/home_state.h"

namespace vrx::apps {

class HomePlay {
public:
    HomePlay(const HomeState& state, const AgentView& view);
    ~HomePlay();
    HomePlay(const HomePlay&) = delete;
    HomePlay& operator=(const HomePlay&) = delete;

    // Lets the time pass up to the date, or up to what is too much to play.
    void playUntil(platform::Date date);
    // Lets the time pass until nothing more comes that anybody would see, at most up to the date.
    void playToTheEnd(platform::Date latest);

    platform::Date now() const { return host_.clock.now(); }
    // All since the beginning, and what was taken for granted.
    timeline::Chronicle chronicle();
    // What is registered at the moment at which the play stands. The last runs are those before the play.
    std::vector<AgentActivity> activities() const;
    // What went wrong with the play itself; empty if nothing did.
    const std::string& failure() const { return failure_; }
    // Whether it stopped before its time because too much happens.
    bool isCutShort() const { return isCutShort_; }

private:
    void takeDevice(const AgentView& view);
    void takeSettings(const AgentView& view);
    void takeRecords(const AgentView& view);
    void takeActivities(platform::Duration minimumInterval);

    const HomeState state_;
    std::string failure_;
    std::vector<std::string> withoutRecord_;  // serial numbers
    bool isCutShort_ = false;
    bool isOver_ = false;                // at the moment at which the play stands
    std::optional<platform::Date> end_;  // once it was played to the end
    platform::Date quietAfter_;          // no offer ends later, and nothing that the home has scheduled comes later

    sim::Host host_;
    std::unique_ptr<timeline::Recorder> recorder_;
};

}  // namespace vrx::apps
