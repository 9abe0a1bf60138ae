// What every host's account store does, simulated or real. The real one renews by a helper that is a line of shell.
#include "vrx/platform/account_store.h"

#include "contract/hosts.h"
#include "vrx/host/account/account_store.h"

namespace vrx {
namespace {

using platform::RenewalResult;

// Given how renewals are made to end: with a token, or failing.
template <class SetRenewal>
void expectContract(platform::AccountStore& store, platform::Queues& queues, SetRenewal setRenewal) {
    const platform::AuthenticationAccount account{"user@cloud", "ALT-1"};
    auto renew = [&](std::optional<std::string> token, std::vector<std::string> services) {
        setRenewal(token);
        RenewalResult result;
        auto renewed = queues.makeEvent();
        store.renewCredentials(account, {.services = std::move(services)}, [&](RenewalResult given) {
            result = std::move(given);
            renewed->set();
        });
        renewed->wait();
        EXPECT_EQ(result.code == RenewalResult::renewed, token.has_value());
        EXPECT_EQ(result.error.has_value(), !token);
    };
    renew("one", {"a", "b"});
    renew("two", {"b"});
    renew(std::nullopt, {"a", "b", "c"});
    EXPECT_EQ(store.credentialToken(account, "a"), "one");
    EXPECT_EQ(store.credentialToken(account, "b"), "two");
    EXPECT_EQ(store.credentialToken(account, "c"), std::nullopt);
    EXPECT_EQ(store.authenticationAccount(store.primaryCloudAccount().value()), account);
}

TEST(AccountStoreContract, Simulated) {
    sim::Host host;
    expectContract(host.accounts, host.queues, [&](const std::optional<std::string>& token) {
        host.accounts.renewalResult = token ? RenewalResult{} : RenewalResult{5, platform::Error{"sim", 5, "failed"}};
        host.accounts.renewedToken = token;
    });
}

TEST(AccountStoreContract, Real) {
    RealHost real;
    host::AccountStore store{real.profile, real.folder.path()};
    expectContract(store, real.queues(), [&](const std::optional<std::string>& token) {
        host::writeFile(real.profile.layers().front(),
                        "[account]\nidentifier = 'user@cloud'\nalt_dsid = 'ALT-1'\n"
                        "credential_helper = ['/bin/sh', '-c', 'echo token=" +
                            token.value_or("") + "']");
    });
}

}  // namespace
}  // namespace vrx
