// Where an application is found, and what a client is told of it.
#include "vrx/support/orvane_support_manager.h"

#include "support/simulated_host.h"

namespace vrx {
namespace {

constexpr const char* app = "com.orvane.support";

class SupportManagerTest : public OnSimulatedHost {
protected:
    // Replied to a connection's thread.
    Value availability() { return replyTo(&VRXOrvaneSupportManager::appSupportAvailability); }
    Value store() { return replyTo(&VRXOrvaneSupportManager::checkIsAvailableInStore); }
    template <class Operation>
    Value replyTo(Operation operation) {
        return replyOf<Value>([this, operation](auto reply) {
            connection->post(
                [operation, reply] { (*std::make_shared<VRXOrvaneSupportManager>().*operation)(app, reply); });
        });
    }

    std::shared_ptr<platform::Queue> connection = host.queues.makeSerialQueue("connection");
};

TEST_F(SupportManagerTest, AnInstalledAppIsAskedForNowhereElse) {
    host.installedApps.installed[app] = {true, "Orvane Inc", "Support"};
    host.localizedStrings.texts["Localizable/INSTALLED"] = "Installiert";
    host.defaults.set("AppSupportAvailability", true);
    EXPECT_EQ(availability()["AppAvailablityText"], Value("Installiert"));
    EXPECT_TRUE(host.store.asked.empty());
    EXPECT_TRUE(host.purchaseHistory.asked.empty());
    EXPECT_EQ(host.log.lastMessage("appSupportAvailability %@ %@ is installed."),
              "appSupportAvailability com.orvane.support Support is installed.");
}

TEST_F(SupportManagerTest, APurchasedAppIsNotLookedUp) {
    host.accounts.mediaAccountIdentifier = 4711;
    host.purchaseHistory.purchases = {{.bundleIdentifier = "com.orvane.other", .title = "Other"},
                                      {.bundleIdentifier = app, .productURL = "https://store.example/app?id=1"},
                                      {.bundleIdentifier = app, .title = "A second one"}};
    EXPECT_EQ(availability()["AppTitleKey"], Value("== Orvane Support =="));
    EXPECT_EQ(host.purchaseHistory.asked.at(0).accountIdentifier, 4711);
    EXPECT_TRUE(host.store.asked.empty());

    host.accounts.primary.reset();
    host.purchaseHistory.purchases = {{app, "Support", "Orvane Inc", ""}};
    const Value answer = availability();
    EXPECT_EQ(answer["AppLinkURL"], Value(""));
    EXPECT_EQ(answer["AppTitleKey"], Value("Support"));
    EXPECT_EQ(host.purchaseHistory.asked.at(1).accountIdentifier, 0);
}

TEST_F(SupportManagerTest, AnAppOfTheMarketplaceIsOfferedOnlyWhenItIsTheOnlyOne) {
    const platform::StoreItem item{
        "Support", "Orvane Inc", {{"https://img.example/1"}, {"https://img.example/2"}}, "https://s.example/1"};
    host.store.answer = std::vector{item};
    EXPECT_EQ(store()["AppLinkURL"], Value("https://s.example/1?pt=2003&ct=coverage.settings&mt=8"));
    EXPECT_EQ(host.store.asked,
              (std::vector<std::string>{"register lookup 1", "open lookup 1", "lookup for com.orvane.support",
                                        "look up com.orvane.support"}));
    for (std::size_t count : {0U, 2U}) {
        host.store.answer = std::vector<platform::StoreItem>(count, item);
        EXPECT_EQ(store(), Value(Dictionary{{"AppAvailabilityType", 0}})) << count;
        EXPECT_EQ(availability(), Value(Dictionary{{"AppBundleID", app}, {"AppAvailabilityType", 0}})) << count;
    }

    host.store.answer = platform::Error{"store", 7, "no connection"};
    EXPECT_EQ(availability(), Value(Dictionary{{"AppBundleID", app}}));
    EXPECT_EQ(host.log.lastMessage("Lookup for %@ in the Marketplace failed with error %@"),
              "Lookup for com.orvane.support in the Marketplace failed with error no connection (store 7)");
}

TEST_F(SupportManagerTest, TheOverrideStandsInForTheMarketplaceOnly) {
    host.defaults.set("AppSupportAvailability", true);
    EXPECT_EQ(store()["AppAvailablityText"], Value("OVERRIDE"));
    EXPECT_TRUE(host.store.asked.empty());
    host.purchaseHistory.purchases = {{.bundleIdentifier = app}};
    EXPECT_EQ(availability()["AppAvailablityText"], Value("DOWNLOAD"));
}

}  // namespace
}  // namespace vrx
