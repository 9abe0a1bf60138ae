#include "vrx/host/ipc/bundle_lookup.h"

#include <fcntl.h>
#include <grp.h>
#include <gtest/gtest.h>
#include <poll.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/wait.h>

#include <array>
#include <filesystem>
#include <fstream>

#include "vrx/host/ipc/listening_socket.h"
#include "vrx/host/log/system_log.h"
#include "vrx/platform/platform.h"

namespace vrx::host {
namespace {

using platform::Value;

class BundleLookupTest : public testing::Test {
protected:
    BundleLookupTest() {
        char name[] = "/tmp/vrx-bundle-XXXXXX";
        folder = mkdtemp(name);
        write("app/bin/viewer", "program");
        chmod((folder + "/app/bin/viewer").c_str(), 0755);
        write("app/bundle.toml", "identifier = 'com.example.viewer'\n[entitlements]\n'e' = true\n");
    }
    ~BundleLookupTest() override { std::filesystem::remove_all(folder); }

    void write(const std::string& path, const std::string& text) const {
        std::filesystem::create_directories(std::filesystem::path(folder + "/" + path).parent_path());
        std::ofstream(folder + "/" + path) << text;
        std::filesystem::permissions(folder + "/" + path, std::filesystem::perms(0644));
    }
    void makeMode(const std::string& path, mode_t mode) const { chmod((folder + "/" + path).c_str(), mode); }

    std::optional<std::string> identifier(const BundleLookup& lookup = BundleLookup()) const {
        auto bundle = lookup.bundleContaining(folder + "/app/bin/viewer");
        return bundle ? bundle->identifier : std::nullopt;
    }

    SystemLog log{platform::Level::Error};
    platform::Platform platform{{.systemLog = &log}};
    platform::ScopedPlatform current{platform};
    std::string folder;
};

TEST_F(BundleLookupTest, FindsTheNearestBundleFile) {
    EXPECT_EQ(identifier(), "com.example.viewer");
    EXPECT_EQ(BundleLookup().bundleContaining(folder + "/app/bin/viewer")->path, folder + "/app");
    write("app/bin/bundle.toml", "name = 'without an identifier'");
    EXPECT_EQ(BundleLookup().bundleContaining(folder + "/app/bin/viewer")->path, folder + "/app/bin");
    EXPECT_EQ(identifier(), std::nullopt);
    write("app/bin/bundle.toml", "identifier = ");
    EXPECT_FALSE(BundleLookup().bundleContaining(folder + "/app/bin/viewer"));
    write("plain/program", "");
    EXPECT_FALSE(BundleLookup().bundleContaining(folder + "/plain/program"));
}

TEST_F(BundleLookupTest, BelievesNothingThatOthersCanChange) {
    for (const char* part : {"app/bundle.toml", "app", "app/bin", "app/bin/viewer"}) {
        for (mode_t open : {0775u, 0757u}) {
            makeMode(part, open);
            EXPECT_EQ(identifier(), std::nullopt) << part;
        }
        makeMode(part, 0755);
        EXPECT_EQ(identifier(), "com.example.viewer") << part;
    }
    // One that is not believed is not passed over for one further up.
    write("app/bin/bundle.toml", "identifier = 'com.example.inner'");
    makeMode("app/bin/bundle.toml", 0666);
    EXPECT_EQ(identifier(), std::nullopt);
    std::filesystem::remove(folder + "/app/bin/bundle.toml");
    std::filesystem::create_symlink(folder + "/app", folder + "/link");
    EXPECT_FALSE(BundleLookup().bundleContaining(folder + "/link/bin/viewer"));
}

TEST_F(BundleLookupTest, ReadsEntitlementsOfAnyType) {
    write("app/bundle.toml", "[entitlements]\n'a.b' = true\nt = 'x'\nn = 7\nd = 0.5\nl = [1, [2]]\no = {k = false}\n");
    BundleFile file = readBundleFile(folder + "/app").value();
    EXPECT_EQ(Value(file.entitlements), Value(platform::Dictionary{{"a.b", true},
                                                                   {"t", "x"},
                                                                   {"n", 7},
                                                                   {"d", 0.5},
                                                                   {"l", platform::Array{1, platform::Array{2}}},
                                                                   {"o", platform::Dictionary{{"k", false}}}}));
    EXPECT_EQ(readBundleFile(folder).error().code, ENOENT);
}

TEST_F(BundleLookupTest, TakesTestersBundlesFromATrustedProfile) {
    auto facts = std::make_shared<ProfileContent>();
    std::filesystem::create_symlink(folder + "/app/bin/viewer", folder + "/other-name");
    facts->bundles.push_back({{"/nowhere", folder + "/other-name"}, "com.example.tester", {}, {}, {}, {}});
    BundleLookup lookup([facts] { return facts; });
    facts->path = folder + "/device.toml";
    write("device.toml", "");
    makeMode("device.toml", 0666);
    EXPECT_EQ(identifier(lookup), "com.example.viewer");
    makeMode("device.toml", 0644);
    EXPECT_EQ(identifier(lookup), "com.example.tester");
}

TEST_F(BundleLookupTest, EntitlesThePeerByItsProgramAndGroup) {
    // A program of the bundle that connects, and stays until its input ends.
    const std::string program = folder + "/app/bin/viewer";
    std::filesystem::copy_file("/usr/bin/perl", program, std::filesystem::copy_options::overwrite_existing);
    chmod(program.c_str(), 0755);
    ListeningSocket listener;
    ASSERT_FALSE(listener.open(folder + "/socket"));
    FILE* process = popen((program + " -MSocket -e 'socket(S,AF_UNIX,SOCK_STREAM,0);connect(S,pack_sockaddr_un(\"" +
                           folder + "/socket\"))||die;<STDIN>' >&2")
                              .c_str(),
                          "w");
    pollfd incoming{listener.number(), POLLIN, 0};
    ASSERT_EQ(poll(&incoming, 1, -1), 1);
    const Descriptor client(accept(listener.number(), nullptr, nullptr));
    PeerIdentity peer = PeerIdentity::ofPeer(client.number()).value();
    EXPECT_EQ(peer.executable(), program);
    EXPECT_TRUE(peer.runsSameProgram());

    EXPECT_EQ(BundleLookup().entitlement(peer, "e"), Value(true));
    EXPECT_TRUE(BundleLookup().entitlement(peer, "other").isNull());
    auto requireGroup = [this](const std::string& name) {
        write("app/bundle.toml", "group = '" + name + "'\n[entitlements]\ne = true\n");
    };
    requireGroup(getgrgid(getgid())->gr_name);
    EXPECT_EQ(BundleLookup().entitlement(peer, "e"), Value(true));
    requireGroup("nogroup");
    EXPECT_TRUE(BundleLookup().entitlement(peer, "e").isNull());
    auto facts = std::make_shared<ProfileContent>();
    facts->bundles.push_back({{program}, "com.example.tester", {}, {}, "nogroup", {{"e", true}}});
    BundleLookup tester([facts] { return facts; });
    EXPECT_TRUE(tester.entitlement(peer, "e").isNull());
    facts->bundles[0].group = getgrgid(getgid())->gr_name;
    EXPECT_EQ(tester.entitlement(peer, "e"), Value(true));

    pclose(process);
    EXPECT_FALSE(peer.runsSameProgram());
    EXPECT_FALSE(PeerIdentity::ofPeer(client.number()));
}

TEST_F(BundleLookupTest, ListensInThePlaceOfADeadAgentOnly) {
    const std::string path = folder + "/socket";
    struct stat status;
    {
        ListeningSocket first;
        ASSERT_FALSE(first.open(path));
        ASSERT_EQ(stat(path.c_str(), &status), 0);
        EXPECT_EQ(status.st_mode & 0777, 0600u);
        EXPECT_EQ(ListeningSocket().open(path)->code, EADDRINUSE);
        EXPECT_EQ(stat(path.c_str(), &status), 0) << "it is the first one's";
        std::filesystem::rename(path, path + ".kept");
    }
    std::filesystem::rename(path + ".kept", path);
    {
        ListeningSocket next;
        EXPECT_FALSE(next.open(path)) << "nobody answers there";
    }
    EXPECT_NE(stat(path.c_str(), &status), 0) << "it goes with its owner";
    write("file", "");
    EXPECT_EQ(ListeningSocket().open(folder + "/file")->code, EEXIST);
    EXPECT_EQ(ListeningSocket().open("/" + std::string(120, 'x'))->code, ENAMETOOLONG);
}

TEST_F(BundleLookupTest, TellsExecutablesThatAreStillThere) {
    std::array<char, 4096> buffer;
    const std::string own = std::filesystem::read_symlink("/proc/self/exe");
    EXPECT_EQ(std::string(buffer.data(), BundleLookup().executablePath(getpid(), buffer)), own);
    EXPECT_EQ(BundleLookup().executablePath(getpid(), std::span(buffer).first(own.size() - 1)), 0u);
    EXPECT_EQ(BundleLookup().executablePath(-1, buffer), 0u);

    // A program whose file was replaced while it runs.
    const std::string copy = folder + "/cat";
    std::filesystem::copy_file("/bin/cat", copy);
    int input[2];
    ASSERT_EQ(pipe2(input, O_CLOEXEC), 0);
    int started[2];
    ASSERT_EQ(pipe2(started, O_CLOEXEC), 0);
    const pid_t child = fork();
    if (child == 0) {
        dup2(input[0], 0);
        execl(copy.c_str(), "cat", nullptr);
        _exit(1);
    }
    close(started[1]);
    char byte;
    EXPECT_EQ(read(started[0], &byte, 1), 0) << "closed when the program runs";
    EXPECT_EQ(executableOfProcess(child), copy);
    std::filesystem::copy_file("/bin/cat", copy + ".new");
    std::filesystem::rename(copy + ".new", copy);
    EXPECT_EQ(executableOfProcess(child), "");
    close(input[1]);
    waitpid(child, nullptr, 0);
    close(input[0]);
    close(started[0]);
}

}  // namespace
}  // namespace vrx::host
