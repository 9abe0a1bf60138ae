#include "vrx/support/orvane_support_manager.h"

#include <mutex>
#include <optional>
#include <utility>
#include <vector>

#include "vrx/platform/account_store.h"
#include "vrx/platform/defaults_store.h"
#include "vrx/platform/installed_apps.h"
#include "vrx/platform/localized_strings.h"
#include "vrx/platform/log.h"
#include "vrx/platform/platform.h"
#include "vrx/platform/purchase_history.h"
#include "vrx/platform/queue.h"
#include "vrx/platform/store.h"

namespace vrx {

using platform::Dictionary;
using platform::Level;
using platform::Platform;
using platform::Value;

namespace {

// Keys of an answer. "Availablity" and the key of the title are spelled so on purpose: clients know them.
constexpr const char* bundleIDKey = "AppBundleID";
constexpr const char* titleKey = "AppTitleKey";
constexpr const char* vendorNameKey = "AppVendorName";
constexpr const char* linkURLKey = "AppLinkURL";
constexpr const char* iconURLKey = "AppIconURL";
constexpr const char* availabilityTextKey = "AppAvailablityText";
constexpr const char* availabilityTypeKey = "AppAvailabilityType";

// Values of "AppAvailabilityType".
constexpr int notFound = 0;
constexpr int installed = 1;
constexpr int purchased = 2;
constexpr int offered = 3;

constexpr std::string_view overrideSetting = "AppSupportAvailability";
constexpr platform::Duration purchaseWait{5.0};

// The address with the store's campaign appended as it is, even behind a query.
std::string withCampaign(const std::optional<std::string>& address) {
    return address.value_or("").empty() ? std::string() : *address + "?pt=2003&ct=coverage.settings&mt=8";
}

Dictionary overrideAnswer() {
    return {{titleKey, "Orvane Support"},
            {vendorNameKey, "Orvane"},
            {availabilityTextKey, "OVERRIDE"},
            {availabilityTypeKey, installed}};
}

Dictionary offeredAnswer(const platform::StoreItem& item) {
    const std::optional<std::string> icon = item.artwork.empty() ? std::nullopt : item.artwork.front().imageURL;
    return {{linkURLKey, withCampaign(item.productPageURL)},    {iconURLKey, icon.value_or("")},
            {titleKey, item.displayName.value_or("")},          {vendorNameKey, item.artistName.value_or("")},
            {availabilityTextKey, "Free – On the Marketplace"}, {availabilityTypeKey, offered}};
}

Dictionary purchasedAnswer(const platform::Purchase& purchase) {
    return {{linkURLKey, withCampaign(purchase.productURL)},
            // The texts that stand for a missing one are spelled so on purpose.
            {titleKey, purchase.title.value_or("== Orvane Support ==")},
            {vendorNameKey, purchase.developerName.value_or("== Orvane ==")},
            {availabilityTextKey, "DOWNLOAD"},
            {availabilityTypeKey, purchased}};
}

void addTexts(Dictionary& answer, const platform::InstalledAppRecord& app) {
    auto add = [&](const char* key, const std::optional<std::string>& text) {
        if (text) answer[key] = *text;  // a reply must not hold nulls
    };
    add(titleKey, app.localizedName);
    add(vendorNameKey, app.vendorName);
}

std::int64_t storeAccountIdentifier() {
    const platform::AccountStore& accounts = Platform::current().accountStore();
    std::optional<platform::CloudAccount> account = accounts.primaryCloudAccount();
    return account ? accounts.storeAccountIdentifier(*account).value_or(0) : 0;
}

// Passed from the thread that has the purchases to the thread that waits for them. The waiting side takes a copy, so
// purchases that arrive after the wait change nothing.
class PurchaseAnswer {
public:
    void give(const std::vector<platform::Purchase>& purchases, const std::string& bundleIdentifier) {
        for (const platform::Purchase& purchase : purchases) {
            if (purchase.bundleIdentifier != bundleIdentifier) continue;
            std::lock_guard lock(mutex_);
            answer_ = purchasedAnswer(purchase);
            break;
        }
        hasAnswered_->set();
    }

    Dictionary waitFor(platform::Duration limit) {
        hasAnswered_->waitFor(limit);
        std::lock_guard lock(mutex_);
        return answer_;
    }

private:
    const std::shared_ptr<platform::Event> hasAnswered_ = Platform::current().queues().makeEvent();
    std::mutex mutex_;
    Dictionary answer_{{availabilityTypeKey, notFound}};
};

}  // namespace

void VRXOrvaneSupportManager::checkIsAvailableInStore(std::string bundleIdentifier, Reply reply) {
    log(Level::Default, "Checking for %@ in the Marketplace", bundleIdentifier);
    if (Platform::current().defaultsStore().boolean(overrideSetting)) return reply(overrideAnswer());

    // The keys are registered before the bag is opened, which otherwise would lack them.
    platform::Store& store = Platform::current().store();
    const platform::StoreProfile profile = store.lookupProfile();
    store.registerBagKeys(profile);
    auto lookup = store.makeLookup(store.openBag(profile.name, profile.version), bundleIdentifier,
                                   platform::StoreKeyProfile::Lockup);
    auto answer = [bundleIdentifier,
                   reply = std::move(reply)](platform::Result<std::vector<platform::StoreItem>> items) mutable {
        if (!items) {
            log(Level::Default, "Lookup for %@ in the Marketplace failed with error %@", bundleIdentifier,
                items.error());
            return reply(nullptr);
        }
        if (items->size() != 1) return reply(Dictionary{{availabilityTypeKey, notFound}});
        reply(offeredAnswer(items->front()));
    };
    lookup->lookUp({bundleIdentifier}, {}, std::move(answer));
}

Dictionary VRXOrvaneSupportManager::checkAppIsPurchased(const std::string& bundleIdentifier) const {
    auto answer = std::make_shared<PurchaseAnswer>();
    Platform::current().purchaseHistory().runQuery(
        {storeAccountIdentifier(), {bundleIdentifier}},
        [answer, bundleIdentifier](const std::vector<platform::Purchase>& purchases) {
            answer->give(purchases, bundleIdentifier);
        });
    return answer->waitFor(purchaseWait);
}

void VRXOrvaneSupportManager::appSupportAvailability(std::string bundleIdentifier, Reply reply) {
    Dictionary answer{{bundleIDKey, bundleIdentifier}};
    // Asked in this order, and the first that answers counts: installed, purchased, offered.
    const platform::InstalledAppRecord app = Platform::current().installedApps().record(bundleIdentifier);
    if (app.isInstalled) {
        log(Level::Default, "appSupportAvailability %@ %@ is installed.", bundleIdentifier, app.localizedName);
        addTexts(answer, app);
        answer[availabilityTextKey] =
            Platform::current().localizedStrings().localizedString("INSTALLED", "", "Localizable");
        answer[availabilityTypeKey] = installed;
        return reply(answer);
    }

    Dictionary purchase = checkAppIsPurchased(bundleIdentifier);
    if (purchase[availabilityTypeKey] != Value(notFound)) {
        log(Level::Default, "appSupportAvailability %@ is purchased.", bundleIdentifier);
        answer.merge(purchase);
        return reply(answer);
    }

    checkIsAvailableInStore(bundleIdentifier,
                            [answer = std::move(answer), reply = std::move(reply)](Value offer) mutable {
                                // "MarketplaceApp -->" is spelled so on purpose.
                                log(Level::Default, "MarketplaceApp --> appSupportAvailability %@.", offer);
                                if (const Dictionary* entries = offer.asDictionary())
                                    answer.insert(entries->begin(), entries->end());
                                reply(answer);
                            });
}

}  // namespace vrx
