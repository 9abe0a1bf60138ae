// What background activities depend on, as the machine has it: its clocks, routes and power supply, and what its
// services say of network and power. The device profile can override them.
#pragma once

#include "vrx/host/activities/activity_conditions.h"
#include "vrx/host/activities/network_routes.h"
#include "vrx/host/activities/power_supply.h"
#include "vrx/host/bus/machine_services.h"
#include "vrx/host/loop/event_source.h"
#include "vrx/host/profile/device_profile.h"

namespace vrx::host {

// The present moment. Also for tools beside the agent. Any thread.
platform::Moment presentMoment();
// The least time between an activity's run and the one that it schedules itself. The profile can only shorten it.
platform::Duration minimumInterval(const DeviceProfile& profile);

class MachineConditions final : public ActivityConditions {
public:
    // All must outlive the conditions.
    MachineConditions(sd_event* loop, const DeviceProfile& profile, MachineServices& services)
        : loop_(loop), profile_(profile), services_(services) {}

    platform::Moment now() const override { return presentMoment(); }
    bool shouldDefer(bool needsNetwork) const override;
    platform::Duration minimumInterval() const override;
    void start(Calls calls) override;
    bool isNetworkAvailable() override;
    void wakeAt(std::optional<platform::Duration> sinceBoot, Watched watched) override;

private:
    static int onTimer(sd_event_source*, std::uint64_t, void* self);
    static int onWallClockSet(sd_event_source*, int file, std::uint32_t, void* self);
    void watchWallClock() const;
    std::optional<platform::Duration> endOfDoubt() const;
    void powerSupplyChanged() const;
    void servicesChanged() const;

    sd_event* const loop_;
    const DeviceProfile& profile_;
    MachineServices& services_;
    Calls calls_;
    NetworkRoutes routes_{loop_, [this] { calls_.wake(); }};
    PowerSupplyWatch powerSupply_{loop_, [this] { powerSupplyChanged(); }};
    Watched watched_;
    Descriptor wallClock_;
    EventSource timer_;
    EventSource wallClockSource_;
};

}  // namespace vrx::host
