// Owns a message of sd-bus. A message and its bus belong to one thread.
#pragma once

#include <systemd/sd-bus.h>

#include <memory>

namespace vrx::wire {

struct MessageRelease {
    void operator()(sd_bus_message* message) const { sd_bus_message_unref(message); }
};
using MessagePointer = std::unique_ptr<sd_bus_message, MessageRelease>;

}  // namespace vrx::wire
