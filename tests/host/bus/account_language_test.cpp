#include "vrx/host/bus/account_language.h"

#include "host/bus/mock_bus.h"

namespace vrx::host {
namespace {

constexpr const char* accountsName = "org.freedesktop.Accounts";
constexpr const char* accountsMethod = "/org/freedesktop/Accounts FindUserById";
constexpr const char* accountPath = "/org/freedesktop/Accounts/User1000";
constexpr const char* accountObject = "org.freedesktop.Accounts.User";

std::optional<std::string> withoutEncoding(std::string_view name) {
    return std::string(name.substr(0, name.find('.')));
}

class AccountLanguageTest : public BusTest {
protected:
    void runUntilLanguage(const std::optional<std::string>& identifier) {
        runUntil([&] { return language.isSettled() && language.value() == identifier; }, "the language");
    }
    void beAccounts(MockService& service, const char* name) {
        service.methods[accountsMethod] = [](sd_bus_message* call, sd_bus_message* reply) {
            std::int64_t user = 0;
            EXPECT_GT(sd_bus_message_read(call, "x", &user), 0);
            EXPECT_EQ(user, 1000);
            sd_bus_message_append(reply, "o", accountPath);
            return std::nullopt;
        };
        service.answerProperties(accountPath, [name](sd_bus_message* reply) {
            MockService::appendProperty(reply, "UserName", "s", "someone");
            MockService::appendProperty(reply, "Language", "s", name);
        });
    }
    void change(MockService& service, const char* type, const char* name) {
        service.emit(accountPath, accountObject, "Language", type, name);
    }

    int changes = 0;
    AccountLanguage language{
        connection, 1000, "nl_NL", withoutEncoding, [this] { ++changes; }, platform::Duration(1e-6)};
};

TEST_F(AccountLanguageTest, IsFollowedAndStaysWhileNobodyTells) {
    EXPECT_FALSE(language.isSettled());
    bus.start();
    connection.start();
    runUntilLanguage("nl_NL");  // as is kept: there is no such service
    MockService accounts(loop.event(), bus);
    beAccounts(accounts, "");
    accounts.takeName(accountsName);
    runUntil([&] { return accounts.calls == 2; }, "the questions");
    change(accounts, "s", "de_DE.UTF-8");
    runUntilLanguage("de_DE");
    change(accounts, "s", "pt\nX: y");
    change(accounts, "o", "/es");
    change(accounts, "s", std::string(257, 'e').c_str());
    accounts.emit(accountPath, "org.example.Other", "Language", "s", "es_ES");
    accounts.emit("/org/freedesktop/Accounts/User1001", accountObject, "Language", "s", "es_ES");
    change(accounts, "s", "de_DE.ISO-8859-1");
    change(accounts, "s", "it_IT.UTF-8");
    runUntilLanguage("it_IT");
    EXPECT_EQ(changes, 4) << "settled, then to none, to de_DE and to it_IT";

    accounts.leaveName(accountsName);
    runUntil([&] { return !language.isThere(); }, "its going");
    EXPECT_EQ(language.value(), "it_IT");
    beAccounts(accounts, "sv_SE.UTF-8");
    accounts.takeName(accountsName);
    runUntilLanguage("sv_SE");
    change(accounts, "s", "");
    runUntilLanguage(std::nullopt);
    EXPECT_EQ(accounts.calls, 4);
    beAccounts(accounts, "da_DK.UTF-8");
    accounts.invalidate(accountPath, accountObject, "UserName");
    accounts.invalidate(accountPath, accountObject, "Language");
    runUntilLanguage("da_DK");
    EXPECT_EQ(accounts.calls, 6);
}

TEST_F(AccountLanguageTest, IsAbsentWhereItIsRefusedOrBrokenAndOfASystemUser) {
    bus.start();
    MockService accounts(loop.event(), bus);
    accounts.takeName(accountsName);
    const auto nothing = [](auto...) { return std::nullopt; };
    const auto denied = refusal("org.freedesktop.DBus.Error.InteractiveAuthorizationRequired");
    const std::string getAll = std::string(accountPath) + " GetAll";
    for (const auto& [method, broken] : std::initializer_list<std::pair<std::string, MockService::Method>>{
             {accountsMethod, denied},
             {accountsMethod, refusal("org.freedesktop.Accounts.Error.Failed")},
             {accountsMethod, answer("s", accountPath)},
             {accountsMethod, nothing},
             {getAll, denied},
             {getAll, answer("i", 1)},
             {getAll, nothing}}) {
        beAccounts(accounts, "de_DE");
        accounts.methods[method] = broken;
        SystemBus own(loop.event(), bus.address());
        AccountLanguage absent(own, 1000, "nl_NL", withoutEncoding, [] {});
        own.start();
        runUntil([&] { return absent.isSettled(); }, "the answer");
        EXPECT_EQ(absent.value(), "nl_NL") << "as before";
    }
    accounts.calls = 0;
    beAccounts(accounts, "de_DE");
    AccountLanguage ofSystem(connection, 999, std::nullopt, withoutEncoding, [] {});
    EXPECT_TRUE(ofSystem.isSettled());
    connection.start();
    runUntilLanguage("de_DE");
    EXPECT_EQ(accounts.calls, 2);
    EXPECT_FALSE(ofSystem.value());
}

}  // namespace
}  // namespace vrx::host
