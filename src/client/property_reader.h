// Reads the properties of one of the agent's objects: the reply to D-Bus's own "GetAll". A message belongs to one
// thread.
#pragma once

#include <systemd/sd-bus.h>

#include "vrx/platform/error.h"
#include "vrx/platform/value.h"

namespace vrx::client {

// A dictionary by the properties' names. What is of a type that none of them has is left out, or null within a list.
platform::Result<platform::Value> readProperties(sd_bus_message* reply);

}  // namespace vrx::client
