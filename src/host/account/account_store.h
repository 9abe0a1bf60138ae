// The user's cloud account as the device profile names it, its tokens, and their renewal by the profile's credential
// helper. Any thread may ask.
#pragma once

#include "vrx/host/account/credential_renewals.h"
#include "vrx/host/account/credentials.h"
#include "vrx/host/profile/device_profile.h"
#include "vrx/platform/account_store.h"

namespace vrx::host {

class AccountStore final : public platform::AccountStore {
public:
    // The profile must outlive the store. A helper that has not answered within the limit is killed.
    AccountStore(const DeviceProfile& profile, const std::string& home,
                 platform::Duration helperLimit = std::chrono::seconds(60));
    // Makes renewals fail: those under way, and those begun from now on.
    void stop() { renewals_.stop(); }

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
    platform::RenewalResult renew(const CredentialRenewals::Question& question, int stopFile);

    const DeviceProfile& profile_;
    const platform::Duration helperLimit_;
    Credentials credentials_;
    CredentialRenewals renewals_;  // last: its threads use the others
};

}  // namespace vrx::host
