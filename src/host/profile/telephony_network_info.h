// The cellular subscriptions that the device profile lists, else those that the machine's services tell. Any thread may
// ask.
#pragma once

#include "vrx/host/profile/device_profile.h"
#include "vrx/platform/telephony_network_info.h"

namespace vrx::host {

class TelephonyNetworkInfo final : public platform::TelephonyNetworkInfo {
public:
    // The profile must outlive it.
    explicit TelephonyNetworkInfo(const DeviceProfile& profile) : profile_(profile) {}
    std::map<std::string, platform::Carrier> serviceSubscriberCellularProviders() const override {
        return profile_.carriers();
    }
    std::string description() const override;

private:
    const DeviceProfile& profile_;
};

}  // namespace vrx::host
