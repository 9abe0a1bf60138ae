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

}  // namespace
}  // namespace vrx::end_to_end
