// Whether the machine has a network: a default route. Main thread.
#pragma once

#include <functional>

#include "vrx/host/base/descriptor.h"
#include "vrx/host/loop/event_source.h"

namespace vrx::host {

class NetworkRoutes {
public:
    // The event loop must outlive the object. Changes are reported on the loop while setReporting(true) holds.
    NetworkRoutes(sd_event* loop, std::function<void()> onChange) : loop_(loop), onChange_(std::move(onChange)) {}

    // The kernel's present answer. True when it cannot be asked.
    bool hasDefaultRoute() const;
    void setReporting(bool isReporting);

private:
    static int onEvents(sd_event_source*, int file, std::uint32_t, void* self);

    sd_event* const loop_;
    const std::function<void()> onChange_;
    Descriptor events_;  // open while changes are reported
    EventSource source_;
};

}  // namespace vrx::host
