// What every host's account store does, simulated or real. The real one renews by a helper that is a line of shell.
#include "platform/account_store.h"

#include <gtest/gtest.h>

#include <thread>

#include "host/account_store.h"
#include "host/queues.h"
#include "host/support.h"
#include "sim/host.h"

namespace vrx {
namespace {

using platform::AuthenticationAccount;
using platform::CloudAccount;
using platform::RenewalOptions;
using platform::RenewalResult;

class SimulatedAccounts {
public:
    platform::AccountStore& store() { return host_.accounts; }
    void signOut() { host_.accounts.primary = std::nullopt; }
    // Renewals give this token from now on, or fail.
    void setRenewal(std::optional<std::string> token) {
        host_.accounts.renewedToken = token;
        host_.accounts.renewalResult = token ? RenewalResult{} : RenewalResult{5, platform::Error{"sim", 5, "failed"}};
    }
    std::shared_ptr<platform::Event> makeEvent() { return host_.queues.makeEvent(); }
    bool isOnThreadOfItsOwn() const { return !host_.queues.currentLabel().empty(); }

private:
    sim::Host host_;
};

class RealAccounts {
public:
    RealAccounts() { setRenewal(std::nullopt); }
    platform::AccountStore& store() { return store_; }
    void signOut() { host::writeFile(folder_ / "device.toml", ""); }
    void setRenewal(std::optional<std::string> token) {
        host::writeFile(folder_ / "device.toml",
                        "[account]\nidentifier = 'user@cloud'\nalt_dsid = 'ALT-1'\n"
                        "credential_helper = ['/bin/sh', '-c', '" +
                            (token ? "echo token=" + *token : "exit 1") + "']\n");
    }
    std::shared_ptr<platform::Event> makeEvent() { return queues_.makeEvent(); }
    bool isOnThreadOfItsOwn() const { return std::this_thread::get_id() != body_; }

private:
    const std::thread::id body_ = std::this_thread::get_id();
    host::LogRecorder log_;
    host::TemporaryFolder folder_;
    host::MainLoop loop_;
    host::Queues queues_{loop_, 2};
    host::DeviceProfile profile_{folder_ / "device.toml"};
    host::AccountStore store_{profile_, folder_.path()};
};

template <class Subject>
class AccountStoreContract : public testing::Test {
protected:
    RenewalResult renew(std::vector<std::string> services) {
        std::optional<RenewalResult> result;
        auto renewed = subject.makeEvent();
        subject.store().renewCredentials(account, {.avoidUI = true, .services = std::move(services)},
                                         [&, renewed](RenewalResult given) {
                                             EXPECT_FALSE(result);
                                             EXPECT_TRUE(subject.isOnThreadOfItsOwn());
                                             result = std::move(given);
                                             renewed->set();
                                         });
        renewed->wait();
        return *result;
    }
    std::optional<std::string> token(const char* service) { return subject.store().credentialToken(account, service); }

    Subject subject;
    AuthenticationAccount account{"user@cloud", "ALT-1"};
};

struct Names {
    template <class Subject>
    static std::string GetName(int) {
        return std::is_same_v<Subject, SimulatedAccounts> ? "Simulated" : "Real";
    }
};
using Subjects = testing::Types<SimulatedAccounts, RealAccounts>;
TYPED_TEST_SUITE(AccountStoreContract, Subjects, Names);

TYPED_TEST(AccountStoreContract, KnowsTheAccountThatIsSignedIn) {
    const std::optional<CloudAccount> primary = this->subject.store().primaryCloudAccount();
    ASSERT_TRUE(primary);
    EXPECT_EQ(primary->altDSID, "ALT-1");
    EXPECT_EQ(this->subject.store().authenticationAccount(*primary), this->account);
    EXPECT_EQ(this->subject.store().storefront(*primary), std::nullopt);
    EXPECT_EQ(this->subject.store().storeAccountIdentifier(*primary), std::nullopt);
    this->subject.signOut();
    EXPECT_FALSE(this->subject.store().primaryCloudAccount());
}

TYPED_TEST(AccountStoreContract, RenewsEachServicesTokenAndKeepsItWhenThatFails) {
    EXPECT_EQ(this->token("a"), std::nullopt);
    this->subject.setRenewal("one");
    EXPECT_EQ(this->renew({"a", "b"}).code, RenewalResult::renewed);
    EXPECT_EQ(this->token("a"), "one");
    EXPECT_EQ(this->token("b"), "one");
    EXPECT_EQ(this->token("c"), std::nullopt);
    this->subject.setRenewal("two");
    EXPECT_EQ(this->renew({"b"}).code, RenewalResult::renewed);
    this->subject.setRenewal(std::nullopt);
    const RenewalResult failed = this->renew({"a", "b"});
    EXPECT_NE(failed.code, RenewalResult::renewed);
    ASSERT_TRUE(failed.error);
    EXPECT_FALSE(failed.error->text.empty());
    EXPECT_EQ(this->token("a"), "one");
    EXPECT_EQ(this->token("b"), "two");
}

}  // namespace
}  // namespace vrx
