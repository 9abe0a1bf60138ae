#include "vrx/host/account/account_store.h"

#include <sys/stat.h>

#include <future>

#include "host/support.h"
#include "vrx/host/account/credential_helper.h"
#include "vrx/host/loop/main_loop.h"

namespace vrx::host {
namespace {

using platform::RenewalResult;
using namespace ::testing;

class AccountStoreTest : public InFolder {
protected:
    // The helper is this script, run with the folder as its first argument.
    void setHelper(const std::string& script) {
        writeFile(profile.layers().front(),
                  "[account]\nidentifier = 'ada'\ncredential_helper = ['/bin/sh', '-c', '''\n" + script +
                      "''', 'helper', '" + folder.path() + "']\n");
        folder.setMode("device.toml", 0600);
    }
    std::future<RenewalResult> begin(AccountStore& accounts, const std::string& service = "S") {
        auto promise = std::make_shared<std::promise<RenewalResult>>();
        accounts.renewCredentials(account, {.services = {service}},
                                  [promise](const RenewalResult& result) { promise->set_value(result); });
        return promise->get_future();
    }
    RenewalResult renew() { return begin(store).get(); }
    std::string token() const { return store.credentialToken(account, "S").value_or("(none)"); }

    MainLoop loop;  // whose signals its threads leave to it
    DeviceProfile profile{folder / "device.toml"};
    AccountStore store{profile, folder.path()};
    const platform::AuthenticationAccount account{"ada", "A1"};
};

TEST_F(AccountStoreTest, AsksTheHelperAndKeepsItsTokenToItself) {
    const Descriptor leaked(open("/dev/null", O_RDONLY));
    setenv("VRX_LEAKED", "1", 1);
    setHelper("[ -e /proc/$$/fd/" + std::to_string(leaked.number()) +
              " -o \"$VRX_LEAKED\" -o ! \"$PATH\" ] && exit 1\n" +
              "cat >$1/asked; printf 'expiry=1\\ntoken=T=1\\n\\nnot read'");
    EXPECT_EQ(renew().code, RenewalResult::renewed);
    EXPECT_EQ(fileText(folder / "asked"), "account=ada\naltdsid=A1\nservice=S\navoid_ui=1\n\n");
    EXPECT_EQ(token(), "T=1");
    EXPECT_EQ(store.credentialToken({"eve", "A1"}, "S"), std::nullopt);

    const std::string file = std::filesystem::directory_iterator(folder / "credentials")->path();
    EXPECT_EQ(modeOf(file), 0600u);
    EXPECT_THAT(log.lines(), IsEmpty());
    chmod(file.c_str(), 0640);
    EXPECT_EQ(token(), "(none)");
    chmod(file.c_str(), 0600);
    writeFile(file, "by hand\n");
    EXPECT_EQ(token(), "(none)");
    writeFile(file, "by-hand\n");
    EXPECT_EQ(token(), "by-hand");
    EXPECT_THAT(log.lines(), ElementsAre(HasSubstr("must belong to the agent's user"), HasSubstr("holds no token")));
}

TEST_F(AccountStoreTest, ABadHelperFailsWithAReasonAndChangesNoToken) {
    const std::pair<const char*, const char*> helpers[] = {
        {"echo token=new; exit 3", "failed with status 3"},
        {"echo token=new; kill -TERM $$; exit 0", "ended by signal 15"},
        {"true", "printed no token"},
        {"echo token=", "printed no token"},
        {"echo; echo token=new", "printed no token"},
        {"printf '\\377\\000new\\n'; echo token=new", "not key=value"},
        {"printf 'token=new\\r\\n'", "visible characters"},
        {"printf 'token=n\\000ew\\n'", "visible characters"},
        {"head -c 9000 /dev/zero | tr '\\0' x | sed s/^/token=/", "too long"},
        {"yes token=new", "printed too much"},
        {"rm -r $1/credentials; : >$1/credentials; echo token=new", "cannot create"},  // and is in the way from now on
    };
    for (const auto& [script, reason] : helpers) {
        SCOPED_TRACE(script);
        setHelper("echo token=old");
        ASSERT_EQ(renew().code, RenewalResult::renewed);
        setHelper(script);
        const RenewalResult result = renew();
        EXPECT_NE(result.code, RenewalResult::renewed);
        EXPECT_THAT(result.error.value().text, AllOf(HasSubstr(reason), Not(HasSubstr("new"))));
        EXPECT_EQ(token(), &reason == &helpers[std::size(helpers) - 1].second ? "(none)" : "old");
    }
}

// The log as its author would see it: with every level, and with what is private.
class RevealingLog final : public platform::SystemLog {
public:
    bool isOn(platform::Level level) const override { return level >= lowest; }
    void write(const platform::LogEntry& entry) override {
        lines.push_back(entry.message(true));
        redacted += entry.level == platform::Level::Debug ? "" : entry.message();
    }
    std::vector<std::string> takeLines() { return std::exchange(lines, {}); }

    platform::Level lowest = platform::Level::Default;
    std::vector<std::string> lines;
    std::string redacted;
};

TEST_F(AccountStoreTest, LogsWhatTheHelperSaysButNotItsToken) {
    RevealingLog said;
    codec::Digest digest;
    platform::Platform platform({.digest = &digest, .systemLog = &said});
    const platform::ScopedPlatform current(platform);
    const std::string hidden = "(a line that holds the token)", longLine(199, 'x');
    const struct {
        std::string script;
        std::string inShort;  // empty: nothing is logged
        std::string inFull;
    } helpers[] = {
        {"echo token=T", "", ""},
        {"echo one >&2; echo token=SECRET", "1 of 1 lines: one", "0 bytes left out: one"},
        {"printf '\n1\r\n\n2\n3\n4' >&2; exit 3", "3 of 4 lines: 1\n2\n3", "0 bytes left out: 1\n2\n3\n4"},
        {"echo +SECRET-1 >&2; echo token=SECRET; exit 3", "1 of 1 lines: " + hidden, "0 bytes left out: " + hidden},
        {"echo token=SECRET; echo token=OTHER; printf 'a\nSECRET\n OTHER\nb' >&2",
         "3 of 4 lines: a\n" + hidden + "\n" + hidden, "0 bytes left out: a\n" + hidden + "\n" + hidden + "\nb"},
        {"printf 'token= SE CRET\r\n'; echo xSE CRETx >&2", "1 of 1 lines: " + hidden, "0 bytes left out: " + hidden},
        {"echo " + longLine + "é >&2; exit 3", "1 of 1 lines: " + longLine + "... (2 more bytes)",
         "0 bytes left out: " + longLine + "é"},
        // What is kept ends within the token.
        {"yes '' | head -c 16379 >&2; printf 'x\nSECRET\n' >&2; echo token=SECRET", "1 of 1 lines: x",
         "7 bytes left out: x"},
        {"yes SECRET | head -c 200000 >&2; echo token=SECRET; kill -9 $$",
         "3 of 2340 lines: " + hidden + "\n" + hidden + "\n" + hidden, ""},
    };
    for (const auto& [script, inShort, inFull] : helpers) {
        SCOPED_TRACE(script);
        setHelper(script);
        for (const platform::Level lowest : {platform::Level::Default, platform::Level::Debug}) {
            said.lowest = lowest;
            renew();
            const std::vector<std::string> lines = said.takeLines();
            ASSERT_EQ(lines.size(), inShort.empty() ? 0u : lowest == platform::Level::Debug ? 2u : 1u);
            if (inShort.empty()) continue;
            EXPECT_EQ(lines.front(), "The credential helper said, " + inShort);
            if (lowest == platform::Level::Debug && !inFull.empty()) {
                EXPECT_EQ(lines.back(), "The credential helper said, " + inFull);
            }
            for (const std::string& line : lines) EXPECT_THAT(line, Not(AnyOf(HasSubstr("SECR"), HasSubstr("CRET"))));
        }
    }
    EXPECT_THAT(said.redacted, AllOf(HasSubstr("1 of 1 lines: <private>"), Not(HasSubstr("one"))));
    // One that never stops saying something is ended like any other.
    AccountStore impatient{profile, folder.path(), std::chrono::milliseconds(100)};
    setHelper("yes >&2");
    EXPECT_THAT(begin(impatient).get().error->text, HasSubstr("took too long"));
}

TEST_F(AccountStoreTest, RunsOnlyAHelperThatATrustedProfileNames) {
    setHelper("echo token=new");
    folder.setMode("device.toml", 0666);
    EXPECT_EQ(renew().code, static_cast<int>(CredentialFailure::NotTrusted));
    writeFile(profile.layers().front(), "[account]\nidentifier = 'ada'\ncredential_helper = ['/no/helper']");
    folder.setMode("device.toml", 0600);
    EXPECT_THAT(renew().error->text, HasSubstr("/no/helper cannot be run: No such file"));
    writeFile(profile.layers().front(), "");
    EXPECT_EQ(renew().code, static_cast<int>(CredentialFailure::NotConfigured));
}

TEST_F(AccountStoreTest, EndsAllThatTheHelperBegan) {
    const std::string path = folder / "fifo";
    ASSERT_EQ(mkfifo(path.c_str(), 0600), 0);
    auto renewing = [&](AccountStore& accounts, const std::string& script, bool isStopped = false) {
        const Descriptor fifo(open(path.c_str(), O_RDONLY | O_NONBLOCK));
        Descriptor writer(open(path.c_str(), O_WRONLY));
        setHelper("exec 9>$1/fifo\n" + script);
        std::future<RenewalResult> result = begin(accounts);
        if (isStopped) accounts.stop();
        const RenewalResult given = result.get();
        // The fifo ends with the last process that holds it open, or never.
        writer = Descriptor();
        fcntl(fifo.number(), F_SETFL, 0);
        char byte;
        EXPECT_EQ(read(fifo.number(), &byte, 1), 0);
        return given.error ? given.error->text : "";
    };
    AccountStore impatient{profile, folder.path(), std::chrono::milliseconds(100)};
    EXPECT_THAT(renewing(impatient, "sleep 100000 & sleep 100000"), HasSubstr("took too long"));
    EXPECT_EQ(renewing(store, "sleep 100000 & echo token=T"), "");  // the child keeps the output open
    EXPECT_EQ(renewing(store, "setsid sh -c 'sleep 100000 & sleep 100000' & echo token=T"), "") << "its own group";
    EXPECT_THAT(renewing(store, "sleep 100000", true), HasSubstr("agent is ending"));
    EXPECT_THAT(renewing(store, "sleep 100000"), HasSubstr("agent is ending"));
}

TEST_F(AccountStoreTest, SharesARenewalThatIsUnderWay) {
    ASSERT_EQ(mkfifo((folder / "go").c_str(), 0600), 0);
    const Descriptor go(open((folder / "go").c_str(), O_RDWR));
    setHelper("echo run >>$1/runs; read x <$1/go; echo token=T");
    std::vector<std::future<RenewalResult>> results;
    for (const char* service : {"S", "S", "other", "S"}) results.push_back(begin(store, service));
    ASSERT_EQ(write(go.number(), "1\n2\n3\n", 6), 6);
    for (auto& result : results) EXPECT_EQ(result.get().code, RenewalResult::renewed);
    EXPECT_EQ(fileText(folder / "runs"), "run\nrun\n");
    EXPECT_EQ(renew().code, RenewalResult::renewed);
    EXPECT_EQ(fileText(folder / "runs"), "run\nrun\nrun\n");
}

}  // namespace
}  // namespace vrx::host
