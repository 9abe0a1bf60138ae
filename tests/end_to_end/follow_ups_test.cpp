// Follow-ups as the settings app would show them, and what a tester has it show, beside a running agent.
#include <gtest/gtest.h>

#include <chrono>
#include <csignal>
#include <cstdio>
#include <filesystem>

#include "codec/json.h"
#include "programs.h"

namespace vrx::end_to_end {
namespace {

using platform::Array;
using platform::Dictionary;
using platform::Value;

const std::string legacyIdentifier = "com.orvane.Vireo";
const std::string legacyCacheFile = "home/Library/Application Support/com.orvane.Vireo/Warranty.plist";

std::string record(const std::string& label, bool isOffered = true) {
    return "<plist version='1.0'><dict><key>qxLocalizedOfferLabel</key><string>" + label +
           "</string><key>qxOfferEligibleUntil</key><integer>9999999999</integer><key>featureToggleParameters</key>"
           "<dict><key>qxOfferDisplay</key><" +
           (isOffered ? "true" : "false") + "/></dict></dict></plist>";
}

class FollowUps : public testing::Test {
protected:
    void SetUp() override {
        place_.start();
        ASSERT_TRUE(place_.isReady()) << place_.agent().errors();
    }

    Place::Outcome post(const Value& item) const {
        place_.write("item.json", codec::printedJson(item, codec::JsonLayout::OneLine));
        return place_.vrxhost({"followups", "post", place_ / "item.json", "--json"});
    }
    Array listed() const {
        const Value list =
            place_.vrxhost({"followups", "--json", "--device", place_ / "device.toml"}).document["followUps"];
        return list.asArray() ? *list.asArray() : Array{Value()};
    }

    Place place_;
};

// What a program prints, line by line as it comes.
class Lines {
public:
    explicit Lines(const std::string& command) : stream_(popen(("echo $$; exec " + command).c_str(), "re")) {
        pid_ = std::stoi(next());
    }
    ~Lines() {
        if (stream_) kill(pid_, SIGKILL);
        end();
    }
    Lines(const Lines&) = delete;
    Lines& operator=(const Lines&) = delete;

    std::string next() {
        char* line = nullptr;
        std::size_t size = 0;
        const ssize_t length = getline(&line, &size, stream_);
        std::string text(line, length > 0 ? static_cast<std::size_t>(length) : 0);
        free(line);
        return text;
    }
    Value nextDocument() { return codec::parseJson(next()).value(); }
    void signal(int number) const { kill(pid_, number); }
    // The exit code.
    int end() {
        const int status = stream_ ? pclose(stream_) : 0;
        stream_ = nullptr;
        return WIFEXITED(status) ? WEXITSTATUS(status) : -1;
    }

private:
    std::FILE* stream_;
    int pid_ = 0;
};

TEST_F(FollowUps, AreShownAsTheSettingsAppWould) {
    // Dates and days so long that it does not matter when this runs.
    ASSERT_EQ(place_.vrxhost({"defaults", "write", "OneDayInterval", "1e12"}).code, 0);
    struct Case {
        Value expires;
        Value userInfo;
        Value derived;
    };
    const Value one = "Last day", format = "%@ days";
    const auto device = [](const char* serialNumber) { return Dictionary{{"FollowupSerialNumber", serialNumber}}; };
    auto whole = [&](const char* serialNumber, bool roundsUp) {
        Dictionary info = device(serialNumber);
        info.insert({{"DaysLeftRoundsUp", roundsUp}, {"OneDayLeftText", one}, {"DaysLeftFormat", format}});
        return Value(info);
    };
    const Case cases[] = {
        {1e15, whole("VRXPHONE0001", true),
         Dictionary{{"relativeText", "1,000 days"}, {"daysLeft", 1000}, {"deviceName", "Maya's Phone"}}},
        {1e15, whole("VRXWATCH0001", false),
         Dictionary{{"relativeText", "999 days"}, {"deviceName", "Maya's Watch"}, {"expired", false}}},
        {"9999-12-31T23:59:59Z", whole("OTHER", true),
         Dictionary{{"relativeText", one}, {"daysLeft", 1}, {"deviceName", nullptr}, {"differsFromFooter", false}}},
        {"2001-01-01T00:00:00Z", whole("OTHER", false),
         Dictionary{{"relativeText", one}, {"daysLeft", 0}, {"expired", true}, {"expires", "2001-01-01T00:00:00Z"}}},
        {nullptr, whole("OTHER", true),
         Dictionary{{"relativeText", nullptr}, {"daysLeft", nullptr}, {"expired", false}, {"expires", nullptr}}},
        {1e15, device("OTHER"), Dictionary{{"relativeText", nullptr}, {"differsFromFooter", false}}},
        {1e15,
         Dictionary{{"FollowupSerialNumber", 1},
                    {"DaysLeftRoundsUp", "yes"},
                    {"OneDayLeftText", true},
                    {"DaysLeftFormat", Array{}}},
         Dictionary{{"relativeText", nullptr}, {"daysLeft", 999}, {"serialNumber", nullptr}}},
    };
    Array posted;
    for (const Case& one : cases) {
        Dictionary item{{"uniqueIdentifier", posted.empty() ? legacyIdentifier : std::to_string(posted.size())},
                        {"displayStyle", posted.empty() ? 19 : 18},
                        {"title", "title"},
                        {"informativeFooterText", "Last day"},
                        {"userInfo", one.userInfo},
                        {"actions", Array{Dictionary{{"label", "label"}}}}};
        if (!one.expires.isNull()) item["expirationDate"] = one.expires;
        EXPECT_EQ(post(item).document["replaced"], Value(false));
        posted.emplace_back(item);
    }
    const Array items = listed();
    ASSERT_EQ(items.size(), std::size(cases));
    for (std::size_t i = 0; i < items.size(); ++i) {
        SCOPED_TRACE(codec::printedJson(items[i], codec::JsonLayout::Indented));
        for (const auto& [key, value] : *cases[i].derived.asDictionary()) EXPECT_EQ(items[i]["derived"][key], value);
        EXPECT_EQ(items[i]["derived"]["legacy"], Value(i == 0));
        EXPECT_EQ(items[i]["derived"]["badge"], Value(i == 0));
        for (const char* key : {"displayStyle", "userInfo", "actions"})
            EXPECT_EQ(items[i]["item"][key], posted[i][key]);
        // What is listed can be posted again, and is then the same.
        EXPECT_EQ(post(items[i]["item"]).document["replaced"], Value(true));
    }
    EXPECT_EQ(listed(), items);
    const std::string text = place_.vrxhost({"followups"}).output;
    EXPECT_NE(text.find("title  [legacy]\n"), std::string::npos) << text;
    EXPECT_NE(text.find("title  [expired]\n"), std::string::npos) << text;
    EXPECT_NE(text.find("1,000 days  (differs from the text)\n"), std::string::npos) << text;
    const Value cleared = place_.vrxhost({"followups", "clear", "1", "8", legacyIdentifier, "--json"}).document;
    EXPECT_EQ(cleared["cleared"], Value(Array{"1", legacyIdentifier}));
    EXPECT_EQ(cleared["notPending"], Value(Array{"8"}));
    EXPECT_EQ(listed().size(), items.size() - 2);
}

TEST_F(FollowUps, AreRefusedWhenTheyMakeNoItem) {
    for (const char* document :
         {"", "[]", "{}", "{\"uniqueIdentifier\": \"\"}", "{\"uniqueIdentifier\": 1}",
          "{\"uniqueIdentifier\": \"a\", \"titel\": \"b\"}", "{\"uniqueIdentifier\": \"a\", \"title\": 1}",
          "{\"uniqueIdentifier\": \"a\", \"displayStyle\": -1}", "{\"uniqueIdentifier\": \"a\", \"displayStyle\": 1.5}",
          "{\"uniqueIdentifier\": \"a\", \"expirationDate\": \"soon\"}",
          "{\"uniqueIdentifier\": \"a\", \"actions\": [{\"title\": \"b\"}]}",
          "{\"uniqueIdentifier\": \"a\", \"userInfo\": {\"b\": [null]}}"}) {
        place_.write("item.json", document);
        const Place::Outcome outcome = place_.vrxhost({"followups", "post", place_ / "item.json", "--json"});
        EXPECT_EQ(outcome.code, 2) << document;
        EXPECT_EQ(outcome.document["error"]["kind"], Value("usage")) << outcome.output;
        EXPECT_NE(outcome.errors.find("item.json"), std::string::npos) << outcome.errors;
    }
    EXPECT_EQ(listed(), Array{});
}

TEST_F(FollowUps, AreWatchedWithoutMissingAChange) {
    const std::string watch = VRX_PROGRAMS "/vrxhost --home " + place_ / "home" + " followups --watch";
    Lines lines(watch + " --json");
    EXPECT_EQ(lines.nextDocument()["followUps"], Value(Array{}));
    for (const char* title : {"one", "two", "three"}) {
        for (int times = 0; times < 2; ++times)
            ASSERT_EQ(post(Dictionary{{"uniqueIdentifier", "a"}, {"title", title}}).code, 0);
        EXPECT_EQ((*lines.nextDocument()["followUps"].asArray())[0]["item"]["title"], Value(title));
    }
    // Changes of something else are none.
    ASSERT_EQ(place_.vrxhost({"defaults", "write", "K", "1"}).code, 0);
    ASSERT_EQ(place_.vrxhost({"followups", "clear", "a"}).code, 0);
    EXPECT_EQ(lines.nextDocument()["followUps"], Value(Array{}));
    // Nor need anything be written for an item to expire.
    const auto soon = std::chrono::system_clock::now() + std::chrono::milliseconds(300);
    const std::chrono::duration<double> seconds = soon.time_since_epoch();
    ASSERT_EQ(post(Dictionary{{"uniqueIdentifier", "a"}, {"expirationDate", seconds.count()}}).code, 0);
    while ((*lines.nextDocument()["followUps"].asArray())[0]["derived"]["expired"] == Value(false)) {
    }
    lines.signal(SIGTERM);
    EXPECT_EQ(lines.next(), "");
    EXPECT_EQ(lines.end(), 0);

    Lines others(watch + " --json 2>/dev/null");
    others.next();
    std::filesystem::remove(place_ / "home/host.db");
    EXPECT_EQ(others.nextDocument()["error"]["kind"], Value("not-reachable"));
    EXPECT_EQ(others.end(), 3);
}

TEST_F(FollowUps, OfTheOlderLayoutAreMovedOnce) {
    const Value old = Dictionary{{"uniqueIdentifier", legacyIdentifier}, {"title", "old"}, {"displayStyle", 19}};
    const auto startOlderLayout = [&](const std::string& cacheFile) {
        ASSERT_EQ(post(old).code, 0);
        ASSERT_EQ(place_.stop(), 0);
        ASSERT_EQ(place_.vrxhost({"defaults", "delete", "VRXMigrationVersion"}).code, 0);
        std::filesystem::create_directories(std::filesystem::path(place_ / legacyCacheFile).parent_path());
        place_.write(legacyCacheFile, cacheFile);
        place_.start();
        ASSERT_TRUE(place_.isReady()) << place_.agent().errors();
        EXPECT_EQ(place_.vrxhost({"defaults", "read", "VRXMigrationVersion", "--json"}).document["value"], Value(2));
    };
    // Without a record, the item is of no use.
    startOlderLayout(record("new").substr(0, 100));
    EXPECT_EQ(listed(), Array{});
    EXPECT_TRUE(std::filesystem::exists(place_ / legacyCacheFile));

    startOlderLayout(record("new"));
    const Array moved = listed();
    ASSERT_EQ(moved.size(), 1u);
    EXPECT_EQ(moved[0]["item"]["title"], Value("new"));
    EXPECT_EQ(moved[0]["item"]["displayStyle"], Value(19));
    EXPECT_EQ(moved[0]["derived"]["serialNumber"], Value("VRXPHONE0001"));
    EXPECT_EQ(moved[0]["derived"]["legacy"], Value(false));
    EXPECT_FALSE(std::filesystem::exists(place_ / legacyCacheFile));

    // Both, as an end within the move leaves them.
    startOlderLayout(record("newer"));
    const Array kept = listed();
    ASSERT_EQ(kept.size(), 2u);
    EXPECT_EQ(kept[0], moved[0]);
    EXPECT_EQ(kept[1]["item"]["title"], Value("old"));
    EXPECT_EQ(kept[1]["derived"]["legacy"], Value(true));
    ASSERT_EQ(place_.vrxhost({"followups", "clear", legacyIdentifier}).code, 0);
    EXPECT_EQ(listed(), moved);
}

TEST_F(FollowUps, FollowTheRecordUntilItsOfferIsWithdrawnOrTheUserDismissesThem) {
    const std::string watchHash = "ab675094e90357f693f6d0901fae463934e153d61512668f608e06d0a9677e62";
    const std::pair<const char*, std::string> devices[] = {
        {"VRXPHONE0001", "40112c750de1c9f8fefda5fa32c7d6dd536a59a2eba76bf8f5d56685a6797bbd"},
        {"VRXWATCH0001", watchHash}};
    place_.useCoverageFiles();
    for (const auto& [serialNumber, hash] : devices) {
        const Value item = Dictionary{{"uniqueIdentifier", legacyIdentifier + "." + hash},
                                      {"userInfo", Dictionary{{"FollowupSerialNumber", serialNumber}}}};
        ASSERT_EQ(post(item).code, 0);
        place_.write(std::string("coverage/Warranty.") + serialNumber + ".plist", record("first"));
        EXPECT_EQ(place_.vrxctl({"info", serialNumber}).code, 0);
    }
    ASSERT_EQ(listed().size(), 2u);
    for (const Value& item : listed()) EXPECT_EQ(item["item"]["title"], Value("first"));

    place_.write("coverage/Warranty.VRXPHONE0001.plist", record("second"));
    EXPECT_EQ(place_.vrxctl({"info", "--policy", "cached"}).code, 0);
    EXPECT_EQ(listed()[0]["item"]["title"], Value("first"));
    EXPECT_EQ(place_.vrxctl({"info", "--policy", "refresh"}).code, 0);
    EXPECT_EQ(listed()[0]["item"]["title"], Value("second"));

    place_.write("coverage/Warranty.VRXPHONE0001.plist", record("third", false));
    EXPECT_EQ(place_.vrxctl({"all", "--policy", "refresh"}).code, 0);
    EXPECT_EQ(listed().size(), 2u);
    EXPECT_EQ(place_.vrxctl({"all", "--update-follow-ups"}).code, 0);
    ASSERT_EQ(listed().size(), 1u);
    EXPECT_EQ(listed()[0]["derived"]["serialNumber"], Value("VRXWATCH0001"));

    EXPECT_EQ(place_.vrxctl({"dismiss", "VRXWATCH0001"}).code, 0);
    EXPECT_EQ(place_.vrxctl({"all", "--update-follow-ups", "--policy", "refresh"}).code, 0);
    EXPECT_EQ(listed(), Array{});
    const Value dismissed =
        place_.vrxhost({"defaults", "read", "FollowupDismissedSerialNumberHashes", "--json"}).document["value"];
    EXPECT_EQ(dismissed, Value(Array{watchHash}));
}

TEST_F(FollowUps, AreThoseOfTheDatabaseThatIsThere) {
    ASSERT_EQ(post(Dictionary{{"uniqueIdentifier", "a"}}).code, 0);
    std::filesystem::create_directory(place_ / "other");
    ASSERT_EQ(place_.stop(), 0);
    std::filesystem::copy(place_ / "home/host.db", place_ / "other");
    place_.start();
    ASSERT_EQ(place_.vrxhost({"followups", "clear", "a"}).code, 0);
    std::filesystem::rename(place_ / "other/host.db", place_ / "home/host.db");
    EXPECT_EQ(place_.vrxctl({"all", "--policy", "cached", "--update-follow-ups"}).code, 0);
    EXPECT_EQ(listed().size(), 1u);
    EXPECT_EQ(place_.stop(), 0);
    EXPECT_NE(place_.agent().errors().find("was replaced and is opened again"), std::string::npos);
}

}  // namespace
}  // namespace vrx::end_to_end
