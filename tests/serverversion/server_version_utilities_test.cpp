// Which protocol versions client and server share, wherever the server's come from.
#include "vrx/serverversion/server_version_utilities.h"

#include "support/simulated_host.h"

namespace vrx {
namespace {

using Utilities = VRXServerVersionUtilities;

constexpr const char* documentURL = "https://cdn.example/versions.plist";
constexpr const char* cacheKey = "ServerVersionCache";

Value versions(Value low, Value high) {
    return Dictionary{{"LowServerVersion", low}, {"HighServerVersion", high}};
}

class ServerVersionTest : public OnSimulatedHost {
protected:
    ServerVersionTest() {
        host.defaults.registerDefaults(
            {{"LowServerVersion", 2}, {"HighServerVersion", 3}, {"ServerVersionURL", documentURL}});
    }
    void serve(const Value& root) { host.http.answer(documentURL, sim::HttpAnswer::ok(propertyList(root))); }
    bool supported() {
        return replyOf<bool>([](auto completion) { Utilities::serverVersionSupported(std::move(completion)); });
    }
    bool high(VRXServerLookupPolicy policy) {
        return replyOf<bool>([policy](auto completion) {
            Utilities::isHighServerVersionFeaturesetEnabled(policy, std::move(completion));
        });
    }
    std::size_t requests() const { return host.http.sent().size(); }
};

TEST_F(ServerVersionTest, SharesTheTwoNamedVersionsOnly) {
    const std::tuple<Value, bool, bool> cases[] = {
        {versions(3, 4), true, true},
        {versions(1, 4), false, false},
        {versions(2, 2), true, false},
        {versions("2", "3"), true, true},
        {versions(2.0, 3.0), true, true},
        {versions(2.5, 3.5), false, false},
        {versions(4, 2), true, false},
        {versions("x", "3"), true, true},
        {versions(true, 3), false, false},
        {versions(Array{}, 3), false, false},
        {Dictionary{{"LowServerVersion", 3}}, false, false},
        {Dictionary{{"HighServerVersion", 3}}, false, false},
    };
    for (const auto& [document, isSupported, isHigh] : cases) {
        SCOPED_TRACE(document.description());
        serve(document);
        EXPECT_EQ(supported(), isSupported);
        EXPECT_EQ(host.defaults.get(cacheKey), document);
        EXPECT_EQ(high(VRXServerLookupPolicyLocal), isHigh);
        EXPECT_EQ(Utilities::isHighServerVersionFeaturesetEnabled(), isHigh);
    }
    EXPECT_TRUE(host.log.contains("Server version dictionary missing key '%@'"));
    constexpr std::int64_t large = (std::int64_t{1} << 53) + 1;  // as a double the same as the integer before
    host.defaults.set("HighServerVersion", large);
    for (const auto& [number, isHigh] : {std::pair<Value, bool>(large, true), {large - 1, false}, {1e300, false}}) {
        serve(versions(1, number));
        EXPECT_EQ(supported(), isHigh) << number.description();
        EXPECT_EQ(high(VRXServerLookupPolicyLocal), isHigh);
    }
}

TEST_F(ServerVersionTest, ARefreshFallsBackToCacheThenClientAndStoresWhatItUsed) {
    EXPECT_TRUE(supported());  // the server refuses connections
    EXPECT_EQ(host.defaults.get(cacheKey), versions(2, 3));
    host.defaults.set(cacheKey, versions(7, 8));
    EXPECT_FALSE(supported());
    EXPECT_EQ(host.defaults.get(cacheKey), versions(7, 8));
    host.http.answer(documentURL, sim::HttpAnswer::ok("not a property list"));
    EXPECT_FALSE(supported());
    host.http.answer(documentURL, sim::HttpAnswer::status(404, propertyList(versions(2, 3))));
    EXPECT_TRUE(supported()) << "the status is not examined";
}

TEST_F(ServerVersionTest, ADefaultLookupFetchesOnlyWithoutCacheAndStoresOnlyWhatItFetched) {
    EXPECT_TRUE(high(VRXServerLookupPolicyDefault));
    EXPECT_EQ(requests(), 1u);
    EXPECT_TRUE(host.defaults.get(cacheKey).isNull());
    serve(versions(3, 4));
    EXPECT_TRUE(high(17));
    EXPECT_EQ(host.defaults.get(cacheKey), versions(3, 4));
    EXPECT_TRUE(high(VRXServerLookupPolicyDefault));
    EXPECT_EQ(requests(), 2u);
}

TEST_F(ServerVersionTest, ALocalLookupNeverFetches) {
    EXPECT_TRUE(Utilities::isHighServerVersionFeaturesetEnabled());
    EXPECT_TRUE(host.defaults.get(cacheKey).isNull());
    host.defaults.set(cacheKey, "no dictionary");
    EXPECT_TRUE(Utilities::isHighServerVersionFeaturesetEnabled());
    EXPECT_TRUE(host.log.contains("Incorrect format stored in server version cache. Removing it."));
    EXPECT_TRUE(host.defaults.get(cacheKey).isNull());
    EXPECT_EQ(requests(), 0u);
}

TEST_F(ServerVersionTest, AnOverrideWinsUnderEveryPolicy) {
    serve(versions(2, 3));
    host.defaults.set("ServerVersionOverride", versions(2, 2));
    for (VRXServerLookupPolicy policy :
         {VRXServerLookupPolicyDefault, VRXServerLookupPolicyLocal, VRXServerLookupPolicyRefresh}) {
        host.defaults.remove(cacheKey);
        EXPECT_FALSE(high(policy));
        EXPECT_EQ(host.defaults.get(cacheKey), versions(2, 2));
    }
    host.defaults.set("ServerVersionOverride", "rubbish");
    EXPECT_FALSE(supported());
    EXPECT_TRUE(host.log.contains("Incorrect serverDictionary format"));
    EXPECT_EQ(requests(), 0u);
}

TEST_F(ServerVersionTest, ADocumentThatIsNoDictionaryIsFetchedOnceMorePastCaches) {
    host.http.answerOnce(documentURL, sim::HttpAnswer::ok(propertyList(Array{1})));
    serve(versions(3, 4));
    EXPECT_TRUE(supported());
    ASSERT_EQ(requests(), 2u);
    EXPECT_TRUE(host.http.sent()[0].isShared);
    EXPECT_FALSE(host.http.sent()[1].isShared);
    EXPECT_EQ(host.defaults.get(cacheKey), versions(3, 4));

    serve(Array{1});
    EXPECT_TRUE(supported());
    EXPECT_EQ(requests(), 4u);
    EXPECT_EQ(host.defaults.get(cacheKey), versions(3, 4));
    EXPECT_EQ(host.log.lastMessage(
                  "Incorrect format in response detected from URL '%@'. Response: %@. Aborting without retry."),
              std::string("Incorrect format in response detected from URL '") + documentURL +
                  "'. Response: (1). Aborting without retry.");
}

}  // namespace
}  // namespace vrx
