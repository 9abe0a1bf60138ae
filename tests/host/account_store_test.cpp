#include "host/account_store.h"

#include <fcntl.h>
#include <gmock/gmock.h>
#include <sys/stat.h>
#include <unistd.h>

#include <future>

#include "host/account_session.h"
#include "host/credential_helper.h"
#include "host/main_loop.h"
#include "support.h"

namespace vrx::host {
namespace {

using namespace std::chrono_literals;
using platform::AuthenticationAccount;
using platform::RenewalResult;
using ::testing::ElementsAre;
using ::testing::HasSubstr;

class AccountStoreTest : public ::testing::Test {
protected:
    // The helper is this script, run with the folder as its first argument.
    void setHelper(const std::string& script) {
        writeFile(folder / "device.toml",
                  "[account]\nidentifier = 'ada'\nalt_dsid = 'A1'\ncredential_helper = "
                  "['/bin/sh', '-c', '''\n" +
                      script + "''', 'helper', '" + folder.path() + "']\n");
        chmod((folder / "device.toml").c_str(), 0600);
    }
    std::future<RenewalResult> begin(AccountStore& store, const std::string& service) {
        std::promise<RenewalResult> promise;
        std::future<RenewalResult> result = promise.get_future();
        store.renewCredentials(
            account, {.avoidUI = true, .services = {service}},
            [p = std::move(promise)](RenewalResult given) mutable { p.set_value(std::move(given)); });
        return result;
    }
    RenewalResult renew(AccountStore& store) { return begin(store, "S").get(); }
    std::string credentialFile() const {
        return folder / "credentials/" + TemporaryFolder::namesIn(folder / "credentials").at(0);
    }

    LogRecorder log;
    MainLoop loop;  // whose signals its threads leave to it
    TemporaryFolder folder;
    DeviceProfile profile{folder / "device.toml"};
    AccountStore store{profile, folder.path()};
    AccountStore impatient{profile, folder.path(), 100ms};
    const AuthenticationAccount account{"ada", "A1"};
};

TEST_F(AccountStoreTest, AsksTheHelperAndKeepsItsTokenToItself) {
    const int leaked = open("/dev/null", O_RDONLY);
    setenv("VRX_LEAKED", "1", 1);
    setHelper("[ -e /proc/$$/fd/" + std::to_string(leaked) +
              " ] || [ \"$VRX_LEAKED\" ] || [ -z \"$PATH\" ] && exit 1\n"
              "cat >$1/asked; printf 'expiry=1\\ntoken=T=1\\n\\nnot read'");
    const RenewalResult result = renew(store);
    EXPECT_EQ(result.code, RenewalResult::renewed) << result.error->text;
    EXPECT_EQ(fileText(folder / "asked"), "account=ada\naltdsid=A1\nservice=S\navoid_ui=1\n\n");
    EXPECT_EQ(store.credentialToken(account, "S"), "T=1");
    EXPECT_EQ(store.credentialToken({"eve", "A1"}, "S"), std::nullopt);
    ::close(leaked);

    const std::string file = credentialFile();
    struct stat status;
    ASSERT_EQ(stat(file.c_str(), &status), 0);
    EXPECT_EQ(status.st_mode & 0777, 0600u);
    EXPECT_THAT(log.lines(), ElementsAre());
    chmod(file.c_str(), 0640);
    EXPECT_EQ(store.credentialToken(account, "S"), std::nullopt);
    chmod(file.c_str(), 0600);
    writeFile(file, "by hand\n");
    EXPECT_EQ(store.credentialToken(account, "S"), std::nullopt);
    writeFile(file, "by-hand\n");
    EXPECT_EQ(store.credentialToken(account, "S"), "by-hand");
    EXPECT_THAT(log.lines(), ElementsAre(HasSubstr("must belong to the agent's user"), HasSubstr("holds no token")));
}

TEST_F(AccountStoreTest, FailsWithAReasonAndKeepsTheTokenWhateverTheHelperDoes) {
    setHelper("echo token=old");
    ASSERT_EQ(renew(store).code, RenewalResult::renewed);
    struct Case {
        const char* script;
        CredentialFailure code;
        const char* reason;
    };
    const Case cases[] = {
        {"echo token=new; exit 3", CredentialFailure::Status, "failed with status 3"},
        {"echo token=new; kill -TERM $$; exit 0", CredentialFailure::Status, "ended by signal 15"},
        {"exec nothing-of-this-name", CredentialFailure::Status, "failed with status 127"},
        {"true", CredentialFailure::Answer, "printed no token"},
        {"echo token=", CredentialFailure::Answer, "printed no token"},
        {"echo; echo token=new", CredentialFailure::Answer, "printed no token"},
        {"echo error: new; echo token=new", CredentialFailure::Answer, "not key=value"},
        {"printf '\\377\\000\\001new\\n'", CredentialFailure::Answer, "not key=value"},
        {"printf 'token=new\\r\\n'", CredentialFailure::Answer, "visible characters"},
        {"printf 'token=n\\000ew\\n'", CredentialFailure::Answer, "visible characters"},
        {"head -c 9000 /dev/zero | tr '\\0' x | sed s/^/token=/", CredentialFailure::Answer, "too long"},
        {"yes token=new", CredentialFailure::Answer, "printed too much"},
        {"rm $1/credentials/*; rmdir $1/credentials; : >$1/credentials; echo token=new", CredentialFailure::NotStored,
         "cannot create"},
    };
    for (const Case& c : cases) {
        EXPECT_EQ(store.credentialToken(account, "S"), "old") << c.script;
        setHelper(c.script);
        const RenewalResult result = renew(store);
        EXPECT_EQ(result.code, static_cast<int>(c.code)) << c.script;
        ASSERT_TRUE(result.error) << c.script;
        EXPECT_THAT(result.error->text, HasSubstr(c.reason)) << c.script;
        EXPECT_EQ(result.error->text.find("new"), std::string::npos) << c.script;
    }
    setHelper("echo token=new");
    chmod(profile.path().c_str(), 0666);
    EXPECT_EQ(renew(store).code, static_cast<int>(CredentialFailure::NotTrusted));
    writeFile(profile.path(), "[account]\nidentifier = 'ada'\ncredential_helper = ['/no/helper']");
    chmod(profile.path().c_str(), 0600);
    EXPECT_THAT(renew(store).error->text, HasSubstr("/no/helper cannot be run: No such file"));
    writeFile(profile.path(), "");
    EXPECT_EQ(renew(store).code, static_cast<int>(CredentialFailure::NotConfigured));
}

TEST_F(AccountStoreTest, EndsTheHelpersWholeProcessGroup) {
    const std::string path = folder / "fifo";
    ASSERT_EQ(mkfifo(path.c_str(), 0600), 0);
    const Descriptor fifo(open(path.c_str(), O_RDONLY | O_NONBLOCK));
    fcntl(fifo.number(), F_SETFL, 0);
    Descriptor writer;
    auto setHelper = [&](const std::string& script) {
        writer = Descriptor(open(path.c_str(), O_WRONLY));
        AccountStoreTest::setHelper("exec 9>$1/fifo\n" + script);
    };
    // The fifo ends with the last process that holds it open, or never.
    auto expectAllEnded = [&] {
        writer = Descriptor();
        char byte;
        EXPECT_EQ(read(fifo.number(), &byte, 1), 0);
    };
    setHelper("sleep 100000 & sleep 100000");
    const RenewalResult late = renew(impatient);
    EXPECT_EQ(late.code, static_cast<int>(CredentialFailure::TimedOut));
    EXPECT_THAT(late.error->text, HasSubstr("took too long"));
    expectAllEnded();
    setHelper("sleep 100000 & echo token=T");  // its child keeps the output open
    EXPECT_EQ(renew(store).code, RenewalResult::renewed);
    expectAllEnded();
    setHelper("sleep 100000");
    std::future<RenewalResult> stopped = begin(store, "S");
    store.stop();
    EXPECT_EQ(stopped.get().code, static_cast<int>(CredentialFailure::Ended));
    EXPECT_EQ(renew(store).code, static_cast<int>(CredentialFailure::Ended));
    expectAllEnded();
}

TEST_F(AccountStoreTest, SharesARenewalThatIsUnderWay) {
    ASSERT_EQ(mkfifo((folder / "go").c_str(), 0600), 0);
    const int go = open((folder / "go").c_str(), O_RDWR);
    setHelper("echo run >>$1/runs; read x <$1/go; echo token=T");
    std::vector<std::future<RenewalResult>> results;
    for (const char* service : {"S", "S", "other", "S"}) results.push_back(begin(store, service));
    ASSERT_EQ(write(go, "1\n2\n", 4), 4);
    for (auto& result : results) EXPECT_EQ(result.get().code, RenewalResult::renewed);
    EXPECT_EQ(fileText(folder / "runs"), "run\nrun\n");
    ASSERT_EQ(write(go, "3\n", 2), 2);
    EXPECT_EQ(renew(store).code, RenewalResult::renewed);
    EXPECT_EQ(fileText(folder / "runs"), "run\nrun\nrun\n");
    ::close(go);
}

TEST_F(AccountStoreTest, GivesTheSessionsHeaders) {
    const AccountSession session(profile);
    auto headers = [&] {
        platform::HttpRequest request;
        session.addClientInformationHeader(request);
        session.addDeviceIdentifierHeader(request);
        request.headers.merge(session.accountHeaders(request));
        return request.headers;
    };
    writeFile(profile.path(), "[device]\nserial_number = 'SN1'");
    EXPECT_TRUE(headers().empty());
    writeFile(profile.path(),
              "[device]\nserial_number = 'SN1'\nproduct_type = 'P1'\nproduct_version = '2'\n"
              "[account]\nidentifier = 'ada'");
    platform::HttpHeaders made = headers();
    EXPECT_EQ(made["X-Orvane-Client-Info"], "P1 (2) com.orvane.vrxagent");
    EXPECT_EQ(made["X-Orvane-Device-Id"].size(), 64u);
    EXPECT_EQ(made["X-Orvane-Account-Id"], "ada");
    writeFile(profile.path(),
              "[account]\nidentifier = 'ada'\nclient_information = 'c'\ndevice_identifier = 'd'\n"
              "headers = { X-Orvane-Account-Type = '1' }");
    EXPECT_EQ(headers(),
              (platform::HttpHeaders{
                  {"X-Orvane-Client-Info", "c"}, {"X-Orvane-Device-Id", "d"}, {"X-Orvane-Account-Type", "1"}}));
}

}  // namespace
}  // namespace vrx::host
