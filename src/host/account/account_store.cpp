#include "vrx/host/account/account_store.h"

#include "vrx/host/account/credential_helper.h"

namespace vrx::host {

using platform::AuthenticationAccount;
using platform::CloudAccount;
using platform::Error;
using platform::MaybeError;
using platform::RenewalResult;
using platform::Result;

namespace {

RenewalResult failed(const Error& error) {
    return {error.code, error};
}

// The profile's entry of the account. Null when another account, or none, is signed in by now.
std::shared_ptr<const ProfileAccount> entryOf(const DeviceProfile& profile, const CloudAccount& account) {
    std::shared_ptr<const ProfileContent> content = profile.content();
    if (!content->account || content->account->identifier != account.identifier) return nullptr;
    return {content, &*content->account};
}

}  // namespace

AccountStore::AccountStore(const DeviceProfile& profile, const std::string& home, platform::Duration helperLimit)
    : profile_(profile),
      helperLimit_(helperLimit),
      credentials_(home),
      renewals_([this](auto& question, int stopFile) { return renew(question, stopFile); }) {}

std::optional<CloudAccount> AccountStore::primaryCloudAccount() const {
    const std::shared_ptr<const ProfileContent> content = profile_.content();
    if (!content->account) return std::nullopt;
    return CloudAccount{content->account->identifier, content->account->altDSID};
}

std::optional<AuthenticationAccount> AccountStore::authenticationAccount(const CloudAccount& account) const {
    const auto entry = entryOf(profile_, account);
    return entry ? entry->authentication : std::nullopt;
}

std::optional<std::string> AccountStore::credentialToken(const AuthenticationAccount& account,
                                                         std::string_view service) const {
    return credentials_.token(account.identifier, service);
}

void AccountStore::renewCredentials(const AuthenticationAccount& account, platform::RenewalOptions options,
                                    platform::OnceCallback<RenewalResult> completion) {
    renewals_.begin({account, std::move(options)}, std::move(completion));
}

// Runs the helper once for each service. The first failure ends the renewal; tokens stored before it stay.
RenewalResult AccountStore::renew(const CredentialRenewals::Question& question, int stopFile) {
    const std::shared_ptr<const ProfileContent> content = profile_.content();
    if (!content->account || content->account->credentialHelper.empty())
        return failed(credentialError(CredentialFailure::NotConfigured, "no credential helper is configured"));
    if (const auto open = content->account->credentialHelperSource.findOpenToOthers())
        return failed(credentialError(CredentialFailure::NotTrusted,
                                      "the credential helper is not run: others can write " + open->path));
    for (const std::string& service : question.options.services) {
        const CredentialQuestion asked{question.account.identifier, question.account.altDSID, service,
                                       question.options.avoidUI};
        const Result<Secret> token =
            askCredentialHelper(content->account->credentialHelper, asked, helperLimit_, stopFile);
        if (!token) return failed(token.error());
        if (MaybeError error = credentials_.store(asked.account, service, token->text()))
            return failed(credentialError(CredentialFailure::NotStored, error->text));
    }
    return {};
}

std::optional<std::string> AccountStore::storefront(const CloudAccount& account) const {
    const auto entry = entryOf(profile_, account);
    return entry ? entry->storefront : std::nullopt;
}

std::optional<std::int64_t> AccountStore::storeAccountIdentifier(const CloudAccount& account) const {
    const auto entry = entryOf(profile_, account);
    return entry ? entry->storeAccountIdentifier : std::nullopt;
}

}  // namespace vrx::host
