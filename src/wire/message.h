// A message of sd-bus, held. One thread uses it and its bus.
#pragma once

#include <systemd/sd-bus.h>

#include <memory>

namespace vrx::wire {

struct MessageRelease {
    void operator()(sd_bus_message* message) const { sd_bus_message_unref(message); }
};
using MessagePointer = std::unique_ptr<sd_bus_message, MessageRelease>;

}  // namespace vrx::wire
