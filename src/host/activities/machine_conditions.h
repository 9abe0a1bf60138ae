// What background activities depend on, as the machine has it: its clocks, routes and power supply. The device profile
// can override them.
#pragma once

#include "vrx/host/activities/activity_conditions.h"
#include "vrx/host/activities/network_routes.h"
#include "vrx/host/loop/event_source.h"
#include "vrx/host/profile/device_profile.h"

namespace vrx::host {

// The present moment. Also for tools beside the agent. Any thread.
platform::Moment presentMoment();
// The least time between an activity's run and the one that it schedules itself. The profile can only shorten it.
platform::Duration minimumInterval(const DeviceProfile& profile);

class MachineConditions final : public ActivityConditions {
public:
    // The event loop and the profile must outlive the conditions.
    MachineConditions(sd_event* loop, const DeviceProfile& profile) : loop_(loop), profile_(profile) {}

    platform::Moment now() const override { return presentMoment(); }
    bool shouldDefer() const override;
    platform::Duration minimumInterval() const override;
    void start(Calls calls) override;
    bool isNetworkAvailable() override;
    void wakeAt(std::optional<platform::Duration> sinceBoot, bool whenNetworkChanges) override;

private:
    static int onTimer(sd_event_source*, std::uint64_t, void* self);
    static int onWallClockSet(sd_event_source*, int file, std::uint32_t, void* self);
    void watchWallClock() const;

    sd_event* const loop_;
    const DeviceProfile& profile_;
    Calls calls_;
    NetworkRoutes routes_{loop_, [this] { calls_.wake(); }};
    bool isNetworkReported_ = false;
    Descriptor wallClock_;
    EventSource timer_;
    EventSource wallClockSource_;
};

}  // namespace vrx::host
