// What the agent tells applications of changes, and what it does for the settings app.
#include <gtest/gtest.h>

#include <unistd.h>

#include <csignal>

#include "end_to_end/programs.h"
#include "support/eventually.h"
#include "vrx/codec/json.h"

namespace vrx::end_to_end {
namespace {

// vrxctl watch, whose lines are read as they come.
class Watch {
public:
    explicit Watch(const Place& place)
        : process_(place.path(), place / "app/vrxctl", {"--socket", place / "socket", "watch"}, {},
                   {.output = lines_.writer.number()}) {
        lines_.writer = host::Descriptor();
    }
    std::string next() {
        std::string line;
        for (char byte = 0; read(lines_.reader.number(), &byte, 1) == 1 && byte != '\n';) line += byte;
        return line;
    }
    int end() {
        process_.signal(SIGTERM);
        return process_.wait();
    }

private:
    host::Pipe lines_;
    Process process_;
};

class ChangesOfAnAgent : public AtPlace {
protected:
    void SetUp() override { start(); }
    void editProfile(const std::string& before, const std::string& after) const {
        std::string profile = fileText(place_ / "device.toml");
        profile.replace(profile.find(before), before.size(), after);
        place_.write("device.toml", profile);
    }
};

// The lines come in the order of the changes: what raises none is followed by something that does.
TEST_F(ChangesOfAnAgent, AreToldWhenWhatIsShownIsAnother) {
    Watch watch(place_);
    ASSERT_EQ(watch.next(), "follow-ups");
    ASSERT_EQ(watch.next(), "coverage");
    const Arguments post{"followups", "post", place_ / "item.json"};
    place_.write("item.json", R"({"uniqueIdentifier": "com.orvane.Vireo.a", "title": "A"})");
    ASSERT_EQ(place_.vrxhost(post).code, 0);
    EXPECT_EQ(watch.next(), "follow-ups");
    // The same again, a setting, and another client's looking change nothing that is shown.
    ASSERT_EQ(place_.vrxhost(post).code, 0);
    ASSERT_EQ(place_.vrxhost({"defaults", "write", "PostUpgradeOutreachDelay", "172800"}).code, 0);
    ASSERT_EQ(place_.vrxctl({"info", "--policy", "refresh"}).code, 0);
    EXPECT_EQ(watch.next(), "coverage") << "a record where there was none";
    ASSERT_EQ(place_.vrxctl({"info", "--policy", "refresh"}).code, 0);  // the same record
    ASSERT_EQ(place_.vrxctl({"info", "--policy", "cached"}).code, 0);
    ASSERT_EQ(place_.vrxhost({"followups", "clear", "com.orvane.Vireo.a"}).code, 0);
    EXPECT_EQ(watch.next(), "follow-ups");
    // A renamed device.
    editProfile("Maya", "Ada");
    EXPECT_EQ(watch.next(), "follow-ups");
    EXPECT_EQ(watch.next(), "coverage");
    // It survives the agent.
    ASSERT_EQ(place_.stop(), 0);
    place_.start();
    EXPECT_EQ(watch.next(), "follow-ups");
    EXPECT_EQ(watch.next(), "coverage");
    EXPECT_EQ(watch.end(), 0);
    // As a document, too, and with what has changed.
    for (const auto& [words, key] : {std::pair(Arguments{"watch"}, "coverage"), {{"status", "--watch"}, "ok"}}) {
        Arguments arguments{"--socket", place_ / "socket", "--json"};
        arguments.insert(arguments.end(), words.begin(), words.end());
        Process documents(place_.path(), place_ / "app/vrxctl", arguments);
        eventually([&] { return documents.output().ends_with('\n'); }, "the first document");
        documents.signal(SIGTERM);
        EXPECT_EQ(documents.wait(), 0);
        EXPECT_EQ(codec::parseJson(documents.output()).value()[key], Value(true));
    }
}

TEST_F(ChangesOfAnAgent, OfAPairingAreToldAfterTheAgentsOwnRefresh) {
    Watch watch(place_);
    ASSERT_EQ(watch.next(), "follow-ups");
    ASSERT_EQ(watch.next(), "coverage");
    editProfile("serial_number = \"VRXWATCH0001\"", "paired = false\nserial_number = \"VRXWATCH0001\"");
    while (watch.next() != "follow-ups") {
    }
    editProfile("paired = false\n", "");
    while (watch.next() != "follow-ups") {  // the record's own change may come before
    }
    EXPECT_EQ(place_.vrxctl({"info", "VRXWATCH0001", "--policy", "cached"}).code, 0);
    EXPECT_EQ(watch.end(), 0);
}

}  // namespace
}  // namespace vrx::end_to_end
