// The Marketplace, the installed applications and the companion's texts, as the device profile names them.
#include "vrx/host/http/marketplace.h"

#include <future>

#include "host/http/loopback_server.h"
#include "host/support.h"
#include "vrx/host/host.h"

namespace vrx::host {
namespace {

class StoreTest : public ::testing::Test {
protected:
    // With what the server answers, and what the profile says beside its address.
    void start(const std::string& body, const std::string& profile = "") {
        server = std::make_unique<LoopbackServer>([this, body](const std::string& request) {
            asked.push_back(request.substr(0, request.find(" HTTP")));
            return answer("200 OK", body);
        });
        writeFile(folder / "device.toml", "[store]\nlookup_url = '" + server->url("/lookup?v=2") +
                                              "'\npurchase_history_url = '" + server->url("/purchases") + "'\n" +
                                              profile);
    }
    platform::Result<std::vector<platform::StoreItem>> lookUp() {
        std::promise<platform::Result<std::vector<platform::StoreItem>>> result;
        auto& store = platform::Platform::current().store();
        store.makeLookup(store.openBag("lookup", "1"), "caller", platform::StoreKeyProfile::Lockup)
            ->lookUp({"com.a b&c"}, {}, [&](auto items) { result.set_value(std::move(items)); });
        return result.get_future().get();
    }
    std::vector<platform::Purchase> purchases() {
        std::promise<std::vector<platform::Purchase>> result;
        platform::Platform::current().purchaseHistory().runQuery(
            {4711, {"com.app"}}, [&](auto found) { result.set_value(std::move(found)); });
        return result.get_future().get();
    }

    TemporaryFolder folder;
    std::vector<std::string> asked;
    std::unique_ptr<LoopbackServer> server;
    Host host{{.home = folder / "home", .profile = {folder / "device.toml"}}, platform::Level::Error};
};

TEST_F(StoreTest, AsksTheAddressesOfTheProfile) {
    start(
        R"({"items": [{"displayName": "App", "artistName": 7, "artwork": [{}, {"url": "i"}], "productPageURL": "p"}, 3],
              "purchases": [{"bundleIdentifier": "com.app", "title": "App"}]})");
    const auto items = lookUp();
    ASSERT_TRUE(items);
    ASSERT_EQ(items->size(), 1U);
    EXPECT_EQ(items->at(0).displayName, "App");
    EXPECT_EQ(items->at(0).artistName, std::nullopt);
    EXPECT_EQ(items->at(0).artwork.at(1).imageURL, "i");
    EXPECT_EQ(items->at(0).productPageURL, "p");
    EXPECT_EQ(purchases().at(0).title, "App");
    EXPECT_THAT(asked, ElementsAre("GET /lookup?v=2&bundle=com.a%20b%26c&profile=lockup&caller=caller&locale=" +
                                       host.profile().preferredLocaleIdentifier(),
                                   "GET /purchases?account=4711&bundle=com.app"));
}

TEST_F(StoreTest, WithoutAUsableAnswerNothingIsOfferedOrPurchased) {
    EXPECT_EQ(lookUp().error().text, "no store is configured");
    EXPECT_TRUE(purchases().empty());
    start(R"({"items": {}, "purchases": {}})");
    EXPECT_FALSE(lookUp());
    EXPECT_TRUE(purchases().empty());
    start(R"({"items": [5, null], "purchases": [[]]})");
    EXPECT_TRUE(lookUp()->empty());
    EXPECT_TRUE(purchases().empty());
}

TEST_F(StoreTest, AnInstalledAppIsOneWhoseBundleIsBelieved) {
    start("", "[applications]\nfolders = ['" + folder.path() + "/none', '" + folder.path() + "/apps']\n");
    writeFile(folder / "apps/good/bundle.toml", "identifier = 'com.good'\nname = 'Good'\nvendor = 'Ltd.'\n");
    writeFile(folder / "apps/open/bundle.toml", "identifier = 'com.open'\n");
    folder.setMode("apps/open/bundle.toml", 0777);
    const auto& apps = platform::Platform::current().installedApps();
    EXPECT_TRUE(apps.record("com.good").isInstalled);
    EXPECT_EQ(apps.record("com.good").localizedName, "Good");
    EXPECT_EQ(apps.record("com.good").vendorName, "Ltd.");
    EXPECT_FALSE(apps.record("com.open").isInstalled);
    EXPECT_FALSE(apps.record("com.none").isInstalled);
}

TEST_F(StoreTest, TextsAreInTheNearestLanguageThatHasThem) {
    auto text = [&](const std::string& language) {
        start("", "[applications]\ncompanion = '" VRX_SOURCE "/companion'\n[locale]\nlanguage = '" + language + "'\n");
        return platform::Platform::current().localizedStrings().localizedString("INSTALLED", "default", "Localizable");
    };
    EXPECT_EQ(text("de_AT"), "Installiert");
    EXPECT_EQ(text("nl"), "Ge\xC3\xAFnstalleerd");
    EXPECT_EQ(text("fi_FI"), "Installed");
    const auto& strings = platform::Platform::current().localizedStrings();
    EXPECT_EQ(strings.localizedString("MISSING", "default", "Localizable"), "default");
    EXPECT_EQ(strings.localizedString("INSTALLED", "default", "None"), "default");
}

}  // namespace
}  // namespace vrx::host
