#include "vrx/host/ipc/bundle_lookup.h"

#include <grp.h>
#include <poll.h>
#include <sys/socket.h>
#include <sys/stat.h>

#include "host/support.h"
#include "vrx/host/ipc/listening_socket.h"

namespace vrx::host {
namespace {

class BundleLookupTest : public InFolder {
protected:
    BundleLookupTest() {
        umask(022);  // a bundle that others can write is none
        writeFile(viewer, "program");
        folder.setMode("app/bin/viewer", 0755);
        writeFile(folder / "app/bundle.toml", "identifier = 'com.example.viewer'\n[entitlements]\n'e' = true\n");
    }
    // Another program takes the place of what is there.
    static void copyProgram(const std::string& program, const std::string& path) {
        std::filesystem::copy_file(program, path + ".new");
        std::filesystem::rename(path + ".new", path);
    }
    static std::optional<platform::Bundle> bundleOf(const std::string& path) {
        return BundleLookup().bundleContaining(path);
    }

    std::optional<std::string> identifier(const BundleLookup& lookup = BundleLookup()) const {
        auto bundle = lookup.bundleContaining(viewer);
        return bundle ? bundle->identifier : std::nullopt;
    }

    // A program of the bundle that connects to the listener, and stays until its input ends.
    struct Client {
        FILE* process;
        Descriptor socket;
        PeerIdentity identify() const { return PeerIdentity::ofPeer(socket.number()).value(); }
    };
    Client connect(const std::string& path, const std::string& before = "", const std::string& runner = "") {
        copyProgram("/usr/bin/perl", viewer);
        FILE* process =
            popen((runner + viewer + " -MSocket -e '" + before +
                   ";socket(S,AF_UNIX,SOCK_STREAM,0);connect(S,pack_sockaddr_un(\"" + path + "\"))||die;<STDIN>' >&2")
                      .c_str(),
                  "w");
        pollfd incoming{listener.number(), POLLIN, 0};
        if (poll(&incoming, 1, 60'000) != 1) throw std::runtime_error("nobody connects");
        return {process, Descriptor(accept(listener.number(), nullptr, nullptr))};
    }

    const std::string viewer = folder / "app/bin/viewer";
    ListeningSocket listener;
};

TEST_F(BundleLookupTest, FindsTheNearestBundleFile) {
    EXPECT_EQ(identifier(), "com.example.viewer");
    EXPECT_EQ(bundleOf(viewer)->path, folder / "app");
    writeFile(folder / "app/bin/bundle.toml", "name = 'without an identifier'");
    EXPECT_EQ(bundleOf(viewer)->path, folder / "app/bin");
    EXPECT_EQ(identifier(), std::nullopt);
    writeFile(folder / "app/bin/bundle.toml", "identifier = ");
    EXPECT_FALSE(bundleOf(viewer));
    writeFile(folder / "plain/program", "");
    EXPECT_FALSE(bundleOf(folder / "plain/program"));
}

TEST_F(BundleLookupTest, BelievesNothingThatOthersCanChange) {
    for (const char* part : {"app/bundle.toml", "app", "app/bin", "app/bin/viewer"}) {
        for (mode_t open : {0775u, 0757u}) {
            folder.setMode(part, open);
            EXPECT_EQ(identifier(), std::nullopt) << part;
        }
        folder.setMode(part, 0755);
        EXPECT_EQ(identifier(), "com.example.viewer") << part;
    }
    // One that is not believed is not passed over for one further up.
    writeFile(folder / "app/bin/bundle.toml", "identifier = 'com.example.inner'");
    folder.setMode("app/bin/bundle.toml", 0666);
    EXPECT_EQ(identifier(), std::nullopt);
    std::filesystem::remove(folder / "app/bin/bundle.toml");
    std::filesystem::create_symlink(folder / "app", folder / "link");
    EXPECT_FALSE(bundleOf(folder / "link/bin/viewer"));
}

TEST_F(BundleLookupTest, ReadsEntitlementsOfAnyType) {
    writeFile(folder / "app/bundle.toml",
              "[entitlements]\n'a.b' = true\nt = 'x'\nn = 7\nd = 0.5\nl = [1, [2]]\no = {k = false}\n");
    BundleFile file = readBundleFile(folder / "app").value();
    EXPECT_EQ(Value(file.entitlements), Value(Dictionary{{"a.b", true},
                                                         {"t", "x"},
                                                         {"n", 7},
                                                         {"d", 0.5},
                                                         {"l", Array{1, Array{2}}},
                                                         {"o", Dictionary{{"k", false}}}}));
    EXPECT_EQ(readBundleFile(folder.path()).error().code, ENOENT);
}

TEST_F(BundleLookupTest, TakesTestersBundlesFromATrustedProfile) {
    auto facts = std::make_shared<ProfileContent>();
    std::filesystem::create_symlink(viewer, folder / "other-name");
    facts->bundles.push_back({{"/nowhere", folder / "other-name"}, "com.example.tester", {}, {}, {}, {}});
    BundleLookup lookup([facts] { return facts; });
    facts->bundles.back().source.path = folder / "device.toml";
    writeFile(folder / "device.toml", "");
    folder.setMode("device.toml", 0666);
    EXPECT_EQ(identifier(lookup), "com.example.viewer");
    folder.setMode("device.toml", 0644);
    EXPECT_EQ(identifier(lookup), "com.example.tester");
}

TEST_F(BundleLookupTest, EntitlesThePeerByItsProgramAndGroup) {
    ASSERT_FALSE(listener.open(folder / "socket"));
    const Client client = connect(folder / "socket");
    PeerIdentity peer = client.identify();
    EXPECT_EQ(peer.executable(), viewer);
    EXPECT_TRUE(peer.runsSameProgram());

    auto entitlement = [&](const char* name, const BundleLookup& lookup = BundleLookup()) {
        return lookup.entitlement(peer, name).value();
    };
    EXPECT_EQ(entitlement("e"), Value(true));
    EXPECT_TRUE(entitlement("other").isNull());
    auto requireGroup = [this](const std::string& name) {
        writeFile(folder / "app/bundle.toml", "group = '" + name + "'\n[entitlements]\ne = true\n");
    };
    requireGroup(getgrgid(getgid())->gr_name);
    EXPECT_EQ(entitlement("e"), Value(true));
    requireGroup("nogroup");
    EXPECT_TRUE(entitlement("e").isNull());
    auto facts = std::make_shared<ProfileContent>();
    facts->bundles.push_back({{viewer}, "com.example.tester", {}, {}, "nogroup", {{"e", true}}});
    BundleLookup tester([facts] { return facts; });
    EXPECT_TRUE(entitlement("e", tester).isNull());
    facts->bundles[0].group = getgrgid(getgid())->gr_name;
    EXPECT_EQ(entitlement("e", tester), Value(true));

    facts->bundles[0].executables.clear();
    facts->bundles[0].flatpak = "com.example.Viewer";
    EXPECT_TRUE(entitlement("e", tester).isNull()) << "it is in no sandbox";
    EXPECT_EQ(tester.describe(peer), viewer);

    pclose(client.process);
    EXPECT_FALSE(peer.runsSameProgram());
    EXPECT_FALSE(PeerIdentity::ofPeer(client.socket.number()));
}

TEST_F(BundleLookupTest, KnowsAFlatpakApplicationByWhatItsSandboxSays) {
    const std::string runner = geteuid() == 0 ? "" : "unshare -r ";
    if (!runner.empty() && system("unshare -r true") != 0) GTEST_SKIP() << "no user name spaces here";
    ASSERT_FALSE(listener.open(folder / "socket"));
    const Client client = connect("/socket", "chroot(\"" + folder.path() + "\")||die", runner);
    std::filesystem::remove(viewer);  // a sandbox's program is not to be seen from here
    const std::string link = "/proc/" + std::to_string(client.identify().processIdentifier()) + "/exe";
    const std::string info = folder / ".flatpak-info";
    const std::string mine = "[Application]\nname=com.example.Viewer\n[Instance]\nname=other\n";

    auto facts = std::make_shared<ProfileContent>();
    facts->bundles.push_back(
        {{"/usr/bin/other"}, "com.example.other", {}, {}, {}, {{"e", false}}, {}, "com.example.O"});
    facts->bundles.push_back({{}, "com.example.viewer", {}, {}, {}, {{"e", true}}, {}, "com.example.Viewer"});
    const BundleLookup lookup([facts] { return facts; });
    // Its entitlement, and the identifier of its bundle; a process is looked at afresh for each connection.
    const auto told = [&] {
        const PeerIdentity peer = client.identify();
        const BundleLookup::Acceptance acceptance(peer);
        std::array<char, 4096> buffer;
        const std::string path(buffer.data(), lookup.executablePath(peer.processIdentifier(), buffer));
        const auto bundle = lookup.bundleContaining(path);
        EXPECT_EQ(path, bundle ? link : "");
        const bool isEntitled = lookup.entitlement(peer, "e").value() == Value(true);
        return (isEntitled ? "entitled as " : "") + (bundle ? *bundle->identifier : "nobody");
    };
    const std::string viewerItself = "entitled as com.example.viewer";
    const auto described = [&] { return lookup.describe(client.identify()); };

    EXPECT_EQ(told(), "nobody");
    const std::string unknown =
        "process " + std::to_string(client.identify().processIdentifier()) + ", whose program cannot be told,";
    EXPECT_EQ(described(), unknown);
    for (const std::string& other :
         {std::string("[Runtime]\nname=com.example.Viewer\n"), std::string("name=com.example.Viewer\n"),
          "[Application]\nname=com.example/Viewer\n" + mine, mine + "line\n", mine + std::string(65'536, '#')}) {
        writeFile(info, other);
        EXPECT_EQ(told(), "nobody") << other.substr(0, 100);
        EXPECT_THAT(described(),
                    testing::StartsWith(unknown.substr(0, unknown.size() - 1) + ", nor whether it is of a Flatpak"));
    }
    writeFile(info, "[Application]\nname=com.example.Else\n" + mine);
    EXPECT_EQ(told(), "nobody") << "the first name counts";
    EXPECT_EQ(described(), "the Flatpak application com.example.Else");
    writeFile(info, mine);
    EXPECT_EQ(told(), viewerItself);
    EXPECT_EQ(described(), "the Flatpak application com.example.Viewer");

    facts->bundles[1].group = getgrgid(getgid())->gr_name;
    EXPECT_EQ(told(), "com.example.viewer") << "whatever the group";
    EXPECT_EQ(described(), "the Flatpak application com.example.Viewer, which cannot prove the group " +
                               *facts->bundles[1].group + " that its bundle requires,");
    facts->bundles[1].group.reset();
    facts->bundles[1].source.path = folder / "device.toml";
    writeFile(folder / "device.toml", "");
    folder.setMode("device.toml", 0666);
    EXPECT_EQ(told(), "nobody");
    folder.setMode("device.toml", 0644);
    EXPECT_EQ(told(), viewerItself);

    std::filesystem::rename(info, folder / "moved");
    std::filesystem::create_symlink("moved", info);
    EXPECT_EQ(told(), "nobody") << "a link";
    std::filesystem::remove(info);
    mkfifo(info.c_str(), 0644);
    EXPECT_EQ(told(), "nobody") << "a FIFO, which nobody writes";
    pclose(client.process);
}

TEST_F(BundleLookupTest, ListensInThePlaceOfADeadAgentOnly) {
    const std::string path = folder / "socket";
    {
        ListeningSocket first;
        ASSERT_FALSE(first.open(path));
        EXPECT_EQ(ListeningSocket().open(path)->code, EADDRINUSE);
        EXPECT_EQ(modeOf(path), 0600u) << "it is the first one's";
        std::filesystem::rename(path, path + ".kept");
    }
    std::filesystem::rename(path + ".kept", path);
    EXPECT_FALSE(ListeningSocket().open(path)) << "nobody answers there";
    EXPECT_FALSE(std::filesystem::exists(path)) << "it goes with its owner";
    writeFile(folder / "file", "");
    EXPECT_EQ(ListeningSocket().open(folder / "file")->code, EEXIST);
    EXPECT_EQ(ListeningSocket().open("/" + std::string(120, 'x'))->code, ENAMETOOLONG);
}

TEST_F(BundleLookupTest, TellsExecutablesThatAreStillThere) {
    std::array<char, 4096> buffer;
    const std::string own = std::filesystem::read_symlink("/proc/self/exe");
    EXPECT_EQ(std::string(buffer.data(), BundleLookup().executablePath(getpid(), buffer)), own);
    EXPECT_EQ(BundleLookup().executablePath(getpid(), std::span(buffer).first(own.size() - 1)), 0u);
    EXPECT_EQ(BundleLookup().executablePath(-1, buffer), 0u);

    // A program whose file was replaced while it runs.
    const std::string copy = folder / "cat";
    copyProgram("/bin/cat", copy);
    Pipe input, started;
    const pid_t child = inChild([&] {
        dup2(input.reader.number(), 0);
        execl(copy.c_str(), "cat", nullptr);
    });
    EXPECT_EQ(started.rest(), "") << "closed when the program runs";
    EXPECT_EQ(executableOfProcess(child), copy);
    copyProgram("/bin/cat", copy);
    EXPECT_EQ(executableOfProcess(child), "");
    input.writer = Descriptor();
    EXPECT_EQ(endOf(child), 0);
}

}  // namespace
}  // namespace vrx::host
