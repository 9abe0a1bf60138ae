// The simulated Marketplace, purchase history, installed applications and texts. The test sets each of them; all
// requests are recorded.
#pragma once

#include <map>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "vrx/platform/installed_apps.h"
#include "vrx/platform/localized_strings.h"
#include "vrx/platform/purchase_history.h"
#include "vrx/platform/queue.h"
#include "vrx/platform/store.h"

namespace vrx::sim {

class Store final : public platform::Store {
public:
    explicit Store(platform::Queues& queues) : queues_(queues) {}

    platform::StoreProfile lookupProfile() const override { return {"lookup", "1", {"lookup-url"}}; }
    void registerBagKeys(const platform::StoreProfile& profile) override {
        asked.push_back("register " + profile.name + " " + profile.version);
    }
    std::shared_ptr<platform::StoreBag> openBag(const std::string& profile, const std::string& version) override {
        asked.push_back("open " + profile + " " + version);
        return std::make_shared<platform::StoreBag>();
    }
    std::unique_ptr<platform::StoreLookup> makeLookup(std::shared_ptr<platform::StoreBag>, std::string callerName,
                                                      platform::StoreKeyProfile) override {
        asked.push_back("lookup for " + callerName);
        return std::make_unique<Lookup>(*this);
    }

    platform::Result<std::vector<platform::StoreItem>> answer = std::vector<platform::StoreItem>();
    std::vector<std::string> asked;  // in order

private:
    class Lookup final : public platform::StoreLookup {
    public:
        explicit Lookup(Store& store) : store_(store) {}
        void lookUp(const std::vector<std::string>& bundleIdentifiers, const std::vector<std::string>&,
                    Completion completion) override {
            for (const std::string& identifier : bundleIdentifiers) store_.asked.push_back("look up " + identifier);
            store_.queues_.workers(platform::Priority::Background)
                .postAfter(platform::Duration(0.1),
                           [answer = store_.answer, completion = std::move(completion)]() mutable {
                               completion(std::move(answer));
                           });
        }

    private:
        Store& store_;
    };

    platform::Queues& queues_;
};

class PurchaseHistory final : public platform::PurchaseHistory {
public:
    explicit PurchaseHistory(platform::Queues& queues) : queues_(queues) {}

    void runQuery(platform::PurchaseQuery query,
                  platform::OnceCallback<std::vector<platform::Purchase>> resultHandler) override {
        asked.push_back(std::move(query));
        queues_.workers(platform::Priority::Background)
            .postAfter(delay, [answer = purchases, resultHandler = std::move(resultHandler)]() mutable {
                resultHandler(std::move(answer));
            });
    }

    std::vector<platform::Purchase> purchases;
    platform::Duration delay{0.1};
    std::vector<platform::PurchaseQuery> asked;  // in order

private:
    platform::Queues& queues_;
};

class InstalledApps final : public platform::InstalledApps {
public:
    platform::InstalledAppRecord record(const std::string& bundleIdentifier) const override {
        auto app = installed.find(bundleIdentifier);
        return app == installed.end() ? platform::InstalledAppRecord() : app->second;
    }

    std::map<std::string, platform::InstalledAppRecord> installed;  // by bundle identifier
};

class LocalizedStrings final : public platform::LocalizedStrings {
public:
    std::string localizedString(std::string_view key, std::string_view defaultText,
                                std::string_view table) const override {
        auto text = texts.find(std::string(table) + "/" + std::string(key));
        return text == texts.end() ? std::string(defaultText) : text->second;
    }

    std::map<std::string, std::string> texts;  // by "table/key"
};

}  // namespace vrx::sim
