// The machine's power supply. Each call reads it afresh; any thread may ask.
#pragma once

#include <systemd/sd-device.h>
#include <systemd/sd-event.h>

#include <functional>
#include <memory>
#include <string>

namespace vrx::host {

// Whether the machine runs on a battery that is low. False when it reports no battery. Tests pass another root than
// "/".
bool isOnLowBattery(const std::string& root = "");

// Tells, on the event loop, when something about a supply has changed; never where no device manager tells it. Main
// thread.
class PowerSupplyWatch {
public:
    // The event loop must outlive the watch.
    PowerSupplyWatch(sd_event* loop, std::function<void()> onChange) : loop_(loop), onChange_(std::move(onChange)) {}
    void setReporting(bool isReporting);

private:
    struct Unreferenced {
        void operator()(sd_device_monitor* monitor) const { sd_device_monitor_unref(monitor); }
    };
    sd_event* const loop_;
    const std::function<void()> onChange_;
    std::unique_ptr<sd_device_monitor, Unreferenced> monitor_;  // while changes are reported
};

}  // namespace vrx::host
