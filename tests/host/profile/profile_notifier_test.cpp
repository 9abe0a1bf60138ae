#include "vrx/host/profile/profile_notifier.h"

#include <thread>

#include "host/support.h"
#include "vrx/host/home/stored_facts.h"
#include "vrx/host/loop/main_loop.h"
#include "vrx/platform/vendor.h"

namespace vrx::host {
namespace {

using ::testing::Lt;

std::string watch(const std::string& serialNumber, const std::string& more = "") {
    return "[[watches]]\nserial_number = '" + serialNumber + "'\n" + more + "\n";
}

std::string language(const std::string& identifier) {
    return "[locale]\nlanguage = '" + identifier + "'\n";
}

class ProfileNotifierTest : public InFolder {
protected:
    ProfileNotifierTest() {
        writeFile(folder / "machine/etc/locale.conf", "LANG=nl_NL.UTF-8\n");
        listen(platform::languageChangedNotification, "language");
        listen(platform::devicePairedNotification, "paired");
        listen(platform::deviceUnpairedNotification, "unpaired");
    }

    // Begins anew with that profile, as a process does.
    void start(const std::string& text, Duration pause = 20ms) {
        notifier.reset();
        writeFile(path, text);
        profile.emplace(path, folder / "machine");
        notifier.emplace(*profile, database, center);
        notifier->start(
            loop.event(), [] {}, pause);
    }
    void listen(std::string_view name, const std::string& mark) {
        center.registerForNotification(platform::vendorIdentifier(name), loop, [this, mark] {
            raised.push_back(mark);
            if (mark == expectedLast) loop.post([this] { loop.stop(); });
        });
    }
    // What is raised until that one has been.
    std::vector<std::string> raisedUntil(const std::string& last) {
        expectedLast = last;
        loop.postAfter(1min, [this] { loop.stop(); });  // it comes soon, or never
        loop.run();
        return std::exchange(raised, {});
    }

    MainLoop loop;
    Database database{folder / "host.db"};
    NotificationCenter center;
    const std::string path = folder / "place/device.toml";
    std::optional<DeviceProfile> profile;
    std::optional<ProfileNotifier> notifier;
    std::vector<std::string> raised;
    std::string expectedLast;
};

TEST_F(ProfileNotifierTest, TellsWhatEachEditHasChanged) {
    start(language("de") + watch("A"));
    writeFile(path, language("de") + watch("A") + watch("B"));
    EXPECT_THAT(raisedUntil("paired"), ElementsAre("paired")) << "and nothing at the first start";

    writeFile(folder / "place/.device.toml.swp", language("fr") + watch("B") + watch("A", "archived = true"));
    std::filesystem::rename(folder / "place/.device.toml.swp", path);
    EXPECT_THAT(raisedUntil("unpaired"), ElementsAre("language", "unpaired"));
    EXPECT_EQ(storedFact(database, stored_facts::language), "fr");

    writeFile(path, "[[watches]");
    notifier->compare();
    writeFile(path, language("fr") + watch("B", "paired_date = 2026-01-31"));
    EXPECT_THAT(raisedUntil("unpaired"), ElementsAre("paired", "unpaired")) << "it was paired anew";

    std::filesystem::rename(folder / "place", folder / "old");
    std::filesystem::create_directory(folder / "place");
    std::filesystem::create_symlink(folder / "old/device.toml", path);
    writeFile(folder / "old/device.toml", language("es") + watch("B", "paired_date = 2026-01-31"));
    EXPECT_THAT(raisedUntil("language"), ElementsAre("language"));
    writeFile(folder / "old/device.toml", language("it") + watch("B", "paired_date = 2026-01-31"));
    EXPECT_THAT(raisedUntil("language"), ElementsAre("language")) << "edited where the link leads to";

    std::filesystem::remove(path);
    EXPECT_THAT(raisedUntil("unpaired"), ElementsAre("language", "unpaired"));
    EXPECT_EQ(storedFact(database, stored_facts::language), "nl_NL") << "the machine's";
    writeFile(folder / "machine/etc/locale.conf", "LANG=sv_SE.UTF-8\n");
    EXPECT_THAT(raisedUntil("language"), ElementsAre("language"));
}

TEST_F(ProfileNotifierTest, SeesWhatAppearsInAFolderThatIsMadeLater) {
    start("");
    notifier.reset();
    profile.emplace(std::vector{path, folder / "later/on/device.d/"}, folder / "machine");
    notifier.emplace(*profile, database, center);
    notifier->start(
        loop.event(), [] {}, 20ms);
    std::filesystem::create_directories(folder / "later/on");
    writeFile(folder / "later/on/device.d/1.toml", watch("A"));
    EXPECT_THAT(raisedUntil("paired"), ElementsAre("paired"));
    std::filesystem::rename(folder / "later/on/device.d/1.toml", folder / "later/on/device.d/1.toml.old");
    EXPECT_THAT(raisedUntil("unpaired"), ElementsAre("unpaired"));
    writeFile(folder / "elsewhere/x", watch("B"));
    std::filesystem::create_symlink(folder / "elsewhere/x", folder / "later/on/device.d/2.toml");
    EXPECT_THAT(raisedUntil("paired"), ElementsAre("paired"));
    writeFile(folder / "elsewhere/x", watch("C"));
    EXPECT_THAT(raisedUntil("unpaired"), ElementsAre("paired", "unpaired")) << "edited where the link leads to";
}

TEST_F(ProfileNotifierTest, GathersAStormOfEdits) {
    start(language("de") + watch("A", "paired = true "), 100ms);
    std::thread editor([this] {
        const std::string unpaired = language("de") + watch("A", "paired = false"),
                          paired = language("de") + watch("A", "paired = true ");
        for (int i = 0; i < 10'000; ++i)  // in place, without the disk
            std::fstream(path, std::ios::in | std::ios::out) << (i % 2 ? paired : unpaired);
        writeFile(path, language("fr") + watch("A"));
    });
    EXPECT_THAT(raisedUntil("language").size(), Lt(1000u));
    editor.join();
    writeFile(path, language("es") + watch("A"));
    EXPECT_THAT(raisedUntil("language"), ElementsAre("language")) << "the last edit was not missed";
}

// The first answers of a start say what is so; what changes after that is a change.
TEST_F(ProfileNotifierTest, WaitsForWhatServicesTellAndKeepsIt) {
    const auto begin = [&](const ToldFacts& kept) {
        writeFile(path, "");
        profile.emplace(path, folder / "machine");
        profile->tell(kept);
        notifier.emplace(*profile, database, center);
        notifier->holdFor(1h);
        notifier->start(
            loop.event(), [] {}, 1ms);
    };
    begin({});
    notifier->compare();
    EXPECT_FALSE(storedFact(database, stored_facts::language)) << "held";
    const KnownWatch first{.address = "1", .serialNumber = "W1"}, second{.address = "2", .serialNumber = "W2"};
    profile->tell({.language = "de_DE", .watches = {first}});
    notifier->release();
    notifier->compare();
    EXPECT_EQ(storedFact(database, stored_facts::language), "de_DE");
    profile->tell({.language = "de_DE", .watches = {first, second}});
    notifier->factsChanged();
    EXPECT_THAT(raisedUntil("paired"), ElementsAre("paired"));

    ToldFacts kept;
    database.read([&](Connection& connection) { kept = keptFacts(connection, profile->machine().identifier()); });
    EXPECT_EQ(kept, *profile->told());
    begin(kept);
    notifier->release();
    profile->tell({.language = "de_DE", .watches = {second}});
    EXPECT_THAT(raisedUntil("unpaired"), ElementsAre("unpaired"));
    writeFile(path, "watches = []\n");
    EXPECT_THAT(raisedUntil("unpaired"), ElementsAre("unpaired")) << "the profile has the whole list";
}

}  // namespace
}  // namespace vrx::host
