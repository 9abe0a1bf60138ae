#include "vrx/host/profile/profile_notifier.h"

#include <gmock/gmock.h>

#include <thread>

#include "host/support.h"
#include "vrx/host/home/stored_facts.h"
#include "vrx/host/loop/main_loop.h"
#include "vrx/platform/vendor.h"

namespace vrx::host {
namespace {

using namespace std::chrono_literals;
using ::testing::ElementsAre;
using ::testing::Lt;

std::string watch(const std::string& serialNumber, const std::string& more = "") {
    return "[[watches]]\nserial_number = '" + serialNumber + "'\n" + more + "\n";
}

std::string language(const std::string& identifier) {
    return "[locale]\nlanguage = '" + identifier + "'\n";
}

class ProfileNotifierTest : public ::testing::Test {
protected:
    ProfileNotifierTest() {
        writeFile(folder / "machine/etc/locale.conf", "LANG=nl_NL.UTF-8\n");
        listen(platform::languageChangedNotification, "language");
        listen(platform::devicePairedNotification, "paired");
        listen(platform::deviceUnpairedNotification, "unpaired");
    }

    // Begins anew, as a process does.
    void start(platform::Duration pause = 20ms) {
        notifier.reset();
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

    TemporaryFolder folder;
    LogRecorder log;
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
    writeFile(path, language("de") + watch("A"));
    start();
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

TEST_F(ProfileNotifierTest, TellsTheNextProcessWhatChangedMeanwhile) {
    writeFile(path, language("de") + watch("A"));
    start();
    notifier.reset();
    writeFile(path, language("de") + watch("B"));
    start();
    EXPECT_THAT(raisedUntil("unpaired"), ElementsAre("paired", "unpaired"));

    writeFile(path, "[[watches]");  // what nobody understands says nothing of watches
    start();
    writeFile(path, language("fr") + watch("B"));
    EXPECT_THAT(raisedUntil("language"), ElementsAre("language"));
}

TEST_F(ProfileNotifierTest, GathersAStormOfEdits) {
    writeFile(path, language("de") + watch("A", "paired = true "));
    start(100ms);
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

}  // namespace
}  // namespace vrx::host
