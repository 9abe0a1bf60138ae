// What vrxctl tells of an application, and what the agent asked the store for it, whatever the store does.
#include <algorithm>
#include <regex>

#include "end_to_end/coverage_server.h"
#include "vrx/codec/json.h"

namespace vrx::end_to_end {
namespace {

constexpr const char* storeFile = R"({
    "items": [
        {"bundleIdentifier": "com.offered", "displayName": "Offered", "artistName": "Ltd.",
         "productPageURL": "https://store.example/offered?l=1", "artwork": [{"url": "i1"}, {"url": "i2"}]},
        {"bundleIdentifier": "com.a b&c=%2F+é", "displayName": null, "artistName": 7, "artwork": [{}]},
        {"bundleIdentifier": "com.twice"}, {"bundleIdentifier": "com.twice"}],
    "purchases": [
        {"bundleIdentifier": "com.bought", "title": "Bought", "productURL": "https://store.example/bought"},
        {"bundleIdentifier": "com.offered", "account": 4712, "title": "Bought by another"}]
})";

constexpr const char* offered =
    R"({"AppTitleKey": "Offered", "AppVendorName": "Ltd.", "AppIconURL": "i1", "AppAvailabilityType": 3,
        "AppLinkURL": "https://store.example/offered?l=1?pt=2003&ct=coverage.settings&mt=8",
        "AppAvailablityText": "Free – On the Marketplace"})";
constexpr const char* offeredWithoutData =
    R"({"AppTitleKey": "", "AppVendorName": "", "AppIconURL": "", "AppLinkURL": "", "AppAvailabilityType": 3,
        "AppAvailablityText": "Free – On the Marketplace"})";
constexpr const char* bought =
    R"({"AppTitleKey": "Bought", "AppVendorName": "== Orvane ==", "AppAvailabilityType": 2,
        "AppLinkURL": "https://store.example/bought?pt=2003&ct=coverage.settings&mt=8",
        "AppAvailablityText": "DOWNLOAD"})";
constexpr const char* installed =
    R"({"AppTitleKey": "Werkzeug", "AppVendorName": "Ltd.", "AppAvailablityText": "Installiert",
        "AppAvailabilityType": 1})";
constexpr const char* notFound = R"({"AppAvailabilityType": 0})";
constexpr const char* nothing = nullptr;  // not even whether it is offered

class StoreOfAgent : public AtPlace {
protected:
    void SetUp() override {
        setenv("no_proxy", "*", 1);
        place_.write("store.json", storeFile);
        server.emplace(place_.path(), Arguments{"--quiet", "--store", place_ / "store.json"});
        place_.write("apps/tool/bundle.toml", "identifier = 'com.tool'\nname = 'Werkzeug'\nvendor = 'Ltd.'\n");
        useStore(server->url());
        place_.start();
    }
    void useStore(const std::string& url) const {
        place_.write("device.toml",
                     "[account]\nidentifier = 'maya@orvane.example'\nstore_account_identifier = 4711\n"
                     "[locale]\nlanguage = 'de_AT'\n[store]\nlookup_url = '" +
                         url + "/store/lookup'\npurchase_history_url = '" + url +
                         "/store/purchases'\n[applications]\nfolders = ['" + place_ / "apps" +
                         "']\ncompanion = '" VRX_SOURCE "/companion'\n");
    }
    // Asks with and without --json. The requests are those of one asking, none of which a cache may answer.
    void expect(const std::string& verb, const std::string& bundle, const char* answer, std::string requests,
                const std::string& faults = "") const {
        SCOPED_TRACE(verb + " " + bundle + " " + faults);
        server->ask("POST", "/faults", faults);
        const Place::Outcome json = place_.vrxctl({verb, bundle, "--json"});
        const auto count = requests.empty() ? 0 : 1 + std::ranges::count(requests, ' ');
        if (count > 0) requests = std::regex_replace(requests + "!", std::regex(" "), "! ");
        EXPECT_EQ(server->requests(count), requests);
        const Place::Outcome text = place_.vrxctl({verb, bundle});
        server->ask("DELETE", "/faults");
        server->ask("DELETE", "/requests");

        const int code = answer ? 0 : 1;
        EXPECT_EQ(json.code, code) << json.errors;
        EXPECT_EQ(text.code, code) << text.errors;
        Value wanted = answer ? codec::parseJson(answer).value() : Value();
        if (verb == "support") {
            Dictionary entries = wanted.isNull() ? Dictionary() : *wanted.asDictionary();
            entries["AppBundleID"] = bundle;
            wanted = entries;
        }
        EXPECT_EQ(json.document["availability"], wanted) << json.output;
        const std::string* availability = wanted["AppAvailablityText"].asString();
        EXPECT_TRUE(!availability || text.output.find("Availability  " + *availability + "\n") != std::string::npos)
            << text.output;
    }

    std::optional<CoverageServer> server;
};

TEST_F(StoreOfAgent, IsAskedForWhatIsNotInstalled) {
    expect("store", "com.offered", offered, "c200");
    expect("store", "com.twice", notFound, "c200");
    expect("store", "com.bought", notFound, "c200");
    expect("store", "com.a b&c=%2F+é", offeredWithoutData, "c200");
    expect("store", "", nothing, "c400");
    expect("support", "com.offered", offered, "p200 c200");
    expect("support", "com.none", notFound, "p200 c200");
    expect("support", "com.bought", bought, "p200");
    expect("support", "com.tool", installed, "");

    for (const std::string fault : {"status=500", "garbage", "not-json", "array", "empty", "large=20MiB", "drop"}) {
        const std::string status = fault == "status=500" ? "500" : "200";
        expect("store", "com.offered", nothing, "c" + status, "catalogue:" + fault);
        expect("support", "com.offered", nothing, "p200 c" + status, "catalogue:" + fault);
        expect("support", "com.bought", notFound, "p" + status + " c200", "purchases:" + fault);
    }
    expect("store", "com.offered", offeredWithoutData, "c200", "catalogue:nulls");
    expect("support", "com.offered", offered, "p302 moved-p200 c302 moved-c200", "any:redirect");

    place_.write("store.json", "{\"items\": [");
    expect("store", "com.offered", nothing, "c500");
    ASSERT_EQ(place_.vrxhost({"defaults", "write", "AppSupportAvailability", "true"}).code, 0);
    expect("support", "com.none",
           R"({"AppTitleKey": "Orvane Support", "AppVendorName": "Orvane", "AppAvailablityText": "OVERRIDE",
               "AppAvailabilityType": 1})",
           "p500");
    ASSERT_EQ(place_.vrxhost({"defaults", "delete", "AppSupportAvailability"}).code, 0);
    useStore("http://127.0.0.1:1");
    expect("support", "com.offered", nothing, "");
}

// Takes the 5 seconds for which the agent waits.
TEST_F(StoreOfAgent, SlowPurchasesHoldTheirOwnConnectionOnly) {
    server->ask("POST", "/faults", "purchases:hold");
    const std::string socket = place_ / "socket";
    Process slow(place_.path(), place_ / "app/vrxctl", {"--socket", socket, "support", "com.bought", "--json"});
    server->ask("GET", "/requests?atLeast=1&begun=1");
    EXPECT_EQ(place_.vrxctl({"device"}).code, 0);
    EXPECT_EQ(server->ask("GET", "/requests").asArray()->size(), 1u) << "the other connection had to wait";
    EXPECT_EQ(slow.wait(), 0) << slow.errors();
    const Value answer = codec::parseJson(slow.output()).value()["availability"];
    EXPECT_EQ(answer, codec::parseJson(R"({"AppBundleID": "com.bought", "AppAvailabilityType": 0})").value());

    server->ask("DELETE", "/faults");
    EXPECT_EQ(server->requests(2), "p200! c200!");
    server->ask("DELETE", "/requests");
    expect("support", "com.bought", bought, "p200");
}

}  // namespace
}  // namespace vrx::end_to_end
