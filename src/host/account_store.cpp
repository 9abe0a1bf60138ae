#include "host/account_store.h"

#include <thread>

namespace vrx::host {

using platform::AuthenticationAccount;
using platform::CloudAccount;

std::optional<CloudAccount> AccountStore::primaryCloudAccount() const {
    const std::shared_ptr<const ProfileFacts> facts = profile_.facts();
    if (!facts->account) return std::nullopt;
    return CloudAccount{*facts->account};
}

std::optional<AuthenticationAccount> AccountStore::authenticationAccount(const CloudAccount& account) const {
    return AuthenticationAccount{account.identifier, account.altDSID};
}

std::optional<std::string> AccountStore::credentialToken(const AuthenticationAccount&, std::string_view) const {
    return std::nullopt;
}

void AccountStore::renewCredentials(const AuthenticationAccount&, platform::RenewalOptions,
                                    platform::OnceCallback<platform::RenewalResult> completion) {
    std::thread([completion = std::move(completion)]() mutable {
        completion({1, platform::Error{"account", 1, "no credential helper is configured"}});
    }).detach();
}

std::optional<std::string> AccountStore::storefront(const CloudAccount&) const {
    return std::nullopt;
}

std::optional<std::int64_t> AccountStore::storeAccountIdentifier(const CloudAccount&) const {
    return std::nullopt;
}

}  // namespace vrx::host
