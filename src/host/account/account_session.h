// The headers of the account's requests: as the device profile says, else made of the device's properties. Without an
// account there are none. Any thread may ask.
#pragma once

#include "vrx/host/profile/device_profile.h"
#include "vrx/platform/account_store.h"

namespace vrx::host {

class AccountSession final : public platform::AccountSession {
public:
    // The profile must outlive the session.
    explicit AccountSession(const DeviceProfile& profile) : profile_(profile) {}

    void addClientInformationHeader(platform::HttpRequest& request) const override;
    void addDeviceIdentifierHeader(platform::HttpRequest& request) const override;
    platform::HttpHeaders accountHeaders(const platform::HttpRequest& request) const override;

private:
    const DeviceProfile& profile_;
};

}  // namespace vrx::host
