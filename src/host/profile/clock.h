// The system's clock, in the profile's time zone or else the system's. Any thread may ask.
#pragma once

#include "vrx/host/profile/device_profile.h"
#include "vrx/platform/clock.h"

namespace vrx::host {

class Clock final : public platform::Clock {
public:
    // The profile must outlive the clock.
    explicit Clock(const DeviceProfile& profile) : profile_(profile) {}
    platform::Date now() const override;
    std::chrono::seconds timeZoneOffset() const override;

private:
    const DeviceProfile& profile_;
};

}  // namespace vrx::host
