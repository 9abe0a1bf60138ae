// Follow-ups as the settings app would show them, beside a running agent that keeps them true.
#include <chrono>

#include "end_to_end/programs.h"
#include "support/eventually.h"
#include "vrx/codec/json.h"

namespace vrx::end_to_end {
namespace {

const std::string legacyIdentifier = "com.orvane.Vireo";

std::string record(const std::string& label, bool isOffered = true) {
    return host::propertyList({{"qxLocalizedOfferLabel", label},
                               {"qxOfferEligibleUntil", 9'999'999'999},
                               {"featureToggleParameters", Dictionary{{"qxOfferDisplay", isOffered}}}});
}

class FollowUps : public AtPlace {
protected:
    void SetUp() override { place_.start(); }
    Place::Outcome post(const Value& item) const {
        place_.write("item.json", codec::printedJson(item, codec::JsonLayout::OneLine));
        return place_.vrxhost({"followups", "post", place_ / "item.json", "--json"});
    }
    Array listed() const {
        const Value list =
            place_.vrxhost({"followups", "--json", "--device", place_ / "device.toml"}).document["followUps"];
        return list.asArray() ? *list.asArray() : Array{Value()};
    }
};

TEST_F(FollowUps, AreShownAsTheSettingsAppWould) {
    // Days so long that it does not matter when this runs.
    ASSERT_EQ(place_.vrxhost({"defaults", "write", "OneDayInterval", "1e12"}).code, 0);
    struct Case {
        Value expires;
        Dictionary userInfo;
        Dictionary derived;
    };
    auto info = [](const char* serialNumber, bool roundsUp) {
        return Dictionary{{"FollowupSerialNumber", serialNumber},
                          {"DaysLeftRoundsUp", roundsUp},
                          {"OneDayLeftText", "Last day"},
                          {"DaysLeftFormat", "%@ days"}};
    };
    const Case cases[] = {
        {1e15, info("VRXPHONE0001", true), {{"relativeText", "1,000 days"}, {"deviceName", "Maya's Phone"}}},
        {1e15, info("VRXWATCH0001", false), {{"relativeText", "999 days"}, {"deviceName", "Maya's Watch"}}},
        {"9999-12-31T23:59:59Z", info("A", true), {{"relativeText", "Last day"}, {"differsFromFooter", false}}},
        {"2001-01-01T00:00:00Z", info("B", false), {{"daysLeft", 0}, {"expired", true}, {"relativeText", "Last day"}}},
        {nullptr, info("C", true), {{"relativeText", nullptr}, {"expired", false}, {"expires", nullptr}}},
        {1e15,
         {{"FollowupSerialNumber", 1}, {"DaysLeftRoundsUp", "yes"}, {"OneDayLeftText", 1}, {"DaysLeftFormat", Array{}}},
         {{"relativeText", nullptr}, {"daysLeft", 999}, {"serialNumber", nullptr}}},
    };
    for (const Case& one : cases)
        ASSERT_EQ(post(Dictionary{{"uniqueIdentifier", legacyIdentifier + std::to_string(&one - cases)},
                                  {"displayStyle", 18 + (&one - cases) % 2},
                                  {"informativeFooterText", "Last day"},
                                  {"expirationDate", one.expires},
                                  {"userInfo", one.userInfo}})
                      .code,
                  0);
    const Array items = listed();
    ASSERT_EQ(items.size(), std::size(cases));
    for (std::size_t i = 0; i < items.size(); ++i) {
        SCOPED_TRACE(codec::printedJson(items[i], codec::JsonLayout::Indented));
        for (const auto& [key, value] : cases[i].derived) EXPECT_EQ(items[i]["derived"][key], value);
        EXPECT_EQ(items[i]["derived"]["badge"], Value(i % 2 == 1));
        EXPECT_EQ(items[i]["item"]["userInfo"], Value(cases[i].userInfo));
        // What is listed can be posted again, and is then the same.
        EXPECT_EQ(post(items[i]["item"]).document["replaced"], Value(true));
    }
    EXPECT_EQ(listed(), items);
    EXPECT_NE(place_.vrxhost({"followups"}).output.find("1,000 days  (differs from the text)\n"), std::string::npos);

    // What makes no item is refused.
    for (const auto& [key, value] : Dictionary{{"uniqueIdentifier", ""},
                                               {"titel", "a"},
                                               {"displayStyle", -1},
                                               {"expirationDate", "soon"},
                                               {"userInfo", Dictionary{{"a", nullptr}}},
                                               {"actions", Array{Dictionary{{"title", "a"}}}}}) {
        Dictionary item{{"uniqueIdentifier", "a"}};
        item.insert_or_assign(key, value);
        EXPECT_EQ(post(item).document["error"]["kind"], Value("usage")) << key;
    }
    EXPECT_EQ(listed(), items);
}

TEST_F(FollowUps, AreWatchedWithoutMissingAChange) {
    host::Pipe pipe;
    Process watch(place_.path(), place_ / "app/vrxhost", {"--home", place_ / "home", "followups", "--watch", "--json"},
                  {}, {.output = pipe.writer.number()});
    pipe.writer = host::Descriptor();
    std::ifstream lines("/dev/fd/" + std::to_string(pipe.reader.number()));
    const auto next = [&] {
        std::string line;
        std::getline(lines, line);
        return codec::parseJson(line).value();
    };
    const auto nextItem = [&] { return next()["followUps"].asArray()->at(0); };
    EXPECT_EQ(next()["followUps"], Value(Array{}));
    for (const char* title : {"one", "two", "three"}) {
        for (int times = 0; times < 2; ++times)
            ASSERT_EQ(post(Dictionary{{"uniqueIdentifier", "a"}, {"title", title}}).code, 0);
        ASSERT_EQ(place_.vrxhost({"defaults", "write", "K", "--string", title}).code, 0);
        EXPECT_EQ(nextItem()["item"]["title"], Value(title));
    }
    // Nothing need be written for an item to expire.
    const std::chrono::duration<double> now = std::chrono::system_clock::now().time_since_epoch();
    ASSERT_EQ(post(Dictionary{{"uniqueIdentifier", "a"}, {"expirationDate", now.count() + 0.3}}).code, 0);
    eventually([&] { return nextItem()["derived"]["expired"] == Value(true); }, "the item's expiry");
    std::filesystem::remove(place_ / "home/host.db");
    EXPECT_EQ(next()["error"]["kind"], Value("not-reachable"));
    EXPECT_EQ(watch.wait(), 3);
}

TEST_F(FollowUps, OfTheOlderLayoutAreMovedOnceAndThenFollowTheRecord) {
    ASSERT_EQ(post(Dictionary{{"uniqueIdentifier", legacyIdentifier}}).code, 0);
    ASSERT_EQ(place_.stop(), 0);
    ASSERT_EQ(place_.vrxhost({"defaults", "delete", "VRXMigrationVersion"}).code, 0);
    place_.write("home/Library/Application Support/com.orvane.Vireo/Warranty.plist", record("a"));
    place_.start();
    const Array moved = listed();
    EXPECT_EQ(moved.at(0)["item"]["title"], Value("a"));
    EXPECT_EQ(moved.at(0)["derived"]["serialNumber"], Value("VRXPHONE0001"));
    ASSERT_EQ(post(Dictionary{{"uniqueIdentifier", legacyIdentifier}}).code, 0);  // one is left over
    EXPECT_EQ(listed().at(1)["derived"]["legacy"], Value(true));
    const Value cleared = place_.vrxhost({"followups", "clear", "unknown", legacyIdentifier, "--json"}).document;
    EXPECT_EQ(cleared["cleared"], Value(Array{legacyIdentifier}));
    EXPECT_EQ(cleared["notPending"], Value(Array{"unknown"}));
    EXPECT_EQ(listed(), moved);

    // From then on it follows the record.
    place_.useCoverageFiles();
    for (bool isOffered : {true, false}) {
        place_.write("coverage/Warranty.VRXPHONE0001.plist", record("c", isOffered));
        EXPECT_EQ(place_.vrxctl({"all", "--policy", "refresh", "--update-follow-ups"}).code, 0);
        const Array items = listed();
        EXPECT_EQ(items.empty() ? Value() : items[0]["item"]["title"], isOffered ? Value("c") : Value());
    }
}

}  // namespace
}  // namespace vrx::end_to_end
