// The only source of time. Any thread may ask.
#pragma once

#include <chrono>

#include "vrx/platform/date.h"

namespace vrx::platform {

class Clock {
public:
    virtual ~Clock() = default;
    virtual Date now() const = 0;
    // The local time zone's offset from GMT at present; negative in the west.
    virtual std::chrono::seconds timeZoneOffset() const = 0;
};

}  // namespace vrx::platform
