// The connection to the machine's system bus, where the services of the machine tell what they know. Nothing here
// waits: without a bus, or while it is away, the services are silent, and the connection is made anew once it is there.
// Main thread.
#pragma once

#include <systemd/sd-bus.h>

#include <chrono>
#include <functional>
#include <memory>
#include <string>
#include <vector>

#include "vrx/host/loop/event_source.h"

namespace vrx::host {

class BusService;

struct BusSlotRelease {
    void operator()(sd_bus_slot* slot) const { sd_bus_slot_unref(slot); }
};
// Removes its match, or cancels its call, with its owner.
using BusSlot = std::unique_ptr<sd_bus_slot, BusSlotRelease>;

class SystemBus {
public:
    // The loop must outlive the bus. The address is the system's where it is empty.
    explicit SystemBus(sd_event* loop, std::string address = "");
    ~SystemBus();
    SystemBus(const SystemBus&) = delete;
    SystemBus& operator=(const SystemBus&) = delete;

    // Begins to connect, and from then on follows the services that exist.
    void start();

    // For who has nothing else to do: runs the loop until that holds, the time is over, or the process is told to end.
    void runUntil(const std::function<bool()>& holds, std::chrono::milliseconds limit) const;

    // Whether the bus can be there: false only where its address is a socket's path, and no file has that.
    bool hasSocket() const;
    // Null while there is no connection, not even one that is being made.
    sd_bus* connection() const { return connection_.get(); }

private:
    friend class BusService;
    struct Closed {
        void operator()(sd_bus* bus) const {
            sd_bus_detach_event(bus);
            sd_bus_close_unref(bus);
        }
    };

    void connect();
    void tryAgainLater();
    static int onConnected(sd_bus_message*, void* self, sd_bus_error*);
    static int onDisconnected(sd_bus_message*, void* self, sd_bus_error*);
    static int onRetry(sd_event_source*, std::uint64_t, void* self);

    sd_event* const loop_;
    const std::string address_;
    std::vector<BusService*> services_;
    std::unique_ptr<sd_bus, Closed> connection_;
    BusSlot connected_, disconnected_;
    EventSource retry_;
    std::uint64_t pause_;  // before the next attempt, in microseconds
};

}  // namespace vrx::host
