// The user's cloud account, as the device profile names it. Any thread may ask.
#pragma once

#include "host/device_profile.h"
#include "platform/account_store.h"

namespace vrx::host {

class AccountStore final : public platform::AccountStore {
public:
    explicit AccountStore(const DeviceProfile& profile) : profile_(profile) {}

    std::optional<platform::CloudAccount> primaryCloudAccount() const override;
    std::optional<platform::AuthenticationAccount> authenticationAccount(
        const platform::CloudAccount& account) const override;
    std::optional<std::string> credentialToken(const platform::AuthenticationAccount& account,
                                               std::string_view service) const override;
    void renewCredentials(const platform::AuthenticationAccount& account, platform::RenewalOptions options,
                          platform::OnceCallback<platform::RenewalResult> completion) override;
    std::optional<std::string> storefront(const platform::CloudAccount& account) const override;
    std::optional<std::int64_t> storeAccountIdentifier(const platform::CloudAccount& account) const override;

private:
    const DeviceProfile& profile_;
};

}  // namespace vrx::host
