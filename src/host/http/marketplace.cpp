#include "vrx/host/http/marketplace.h"

#include <utility>

#include "vrx/platform/http_request.h"
#include "vrx/platform/json.h"
#include "vrx/platform/locale.h"
#include "vrx/platform/log.h"
#include "vrx/platform/platform.h"
#include "vrx/platform/queue.h"
#include "vrx/platform/value.h"

namespace vrx::host {

using platform::Error;
using platform::HttpResponse;
using platform::Platform;
using platform::Result;
using platform::StoreItem;
using platform::Value;

namespace {

// The lookup's address at the time of opening.
struct Bag final : platform::StoreBag {
    explicit Bag(std::optional<std::string> lookupURL) : lookupURL(std::move(lookupURL)) {}
    const std::optional<std::string> lookupURL;
};

// An address with a query, each value escaped.
class Query {
public:
    explicit Query(const std::string& address)
        : url_(address), separator_(address.find('?') == std::string::npos ? '?' : '&') {}

    Query& add(std::string_view name, std::string_view value) {
        static constexpr char digits[] = "0123456789ABCDEF";
        url_.append(1, std::exchange(separator_, '&')).append(name).append("=");
        for (char c : value) {
            const auto byte = static_cast<unsigned char>(c);
            const bool isPlain = (byte | 0x20) >= 'a' ? (byte | 0x20) <= 'z' : (byte >= '0' && byte <= '9');
            if (isPlain || c == '-' || c == '.' || c == '_' || c == '~')
                url_ += c;
            else
                url_.append({'%', digits[byte >> 4], digits[byte & 15]});
        }
        return *this;
    }
    const std::string& url() const { return url_; }

private:
    std::string url_;
    char separator_;
};

// The list under a key of an answer. An answer without it is an error.
Result<platform::Array> listOf(const HttpResponse& response, const char* key) {
    if (response.error) return *response.error;
    if (response.status != 200)
        return Error{platform::error_domain::store, response.status, "status " + std::to_string(response.status)};
    const platform::Data body = response.body.value_or(platform::Data());
    Result<Value> root = Platform::current().json().parse({reinterpret_cast<const char*>(body.data()), body.size()});
    if (!root) return root.error();
    const platform::Array* list = (*root)[key].asArray();
    if (!list) return Error{platform::error_domain::store, 0, std::string("the answer holds no list of ") + key};
    platform::Array entries;  // of another type they count as missing
    for (const Value& entry : *list)
        if (entry.asDictionary()) entries.push_back(entry);
    return entries;
}

std::optional<std::string> text(const Value& dictionary, std::string_view key) {
    const std::string* text = dictionary[key].asString();
    return text ? std::optional(*text) : std::nullopt;
}

StoreItem itemOf(const Value& entry) {
    StoreItem item{.displayName = text(entry, "displayName"),
                   .artistName = text(entry, "artistName"),
                   .productPageURL = text(entry, "productPageURL")};
    if (const platform::Array* artwork = entry["artwork"].asArray())
        for (const Value& image : *artwork) item.artwork.push_back({text(image, "url")});
    return item;
}

// Always asks the server: what was missing before may have been bought meanwhile.
void get(const std::string& url, platform::OnceCallback<HttpResponse> completion) {
    platform::HttpRequest request;
    request.url = url;
    request.headers["Accept"] = "application/json";
    Platform::current().httpSessions().makeUncached()->send(std::move(request), std::move(completion));
}

class Lookup final : public platform::StoreLookup {
public:
    Lookup(std::shared_ptr<platform::StoreBag> bag, std::string callerName)
        : bag_(std::move(bag)), callerName_(std::move(callerName)) {}

    // Fails on a worker, like any answer, when no address is configured.
    void lookUp(const std::vector<std::string>& bundleIdentifiers, const std::vector<std::string>& itemIdentifiers,
                Completion completion) override {
        const auto* bag = dynamic_cast<const Bag*>(bag_.get());
        if (!bag || !bag->lookupURL) {
            auto fail = [completion = std::move(completion)]() mutable {
                completion(Error{platform::error_domain::store, 0, "no store is configured"});
            };
            return Platform::current().queues().workers(platform::Priority::UserInitiated).post(std::move(fail));
        }
        Query query(*bag->lookupURL);
        for (const std::string& identifier : bundleIdentifiers) query.add("bundle", identifier);
        for (const std::string& identifier : itemIdentifiers) query.add("item", identifier);
        query.add("profile", "lockup").add("caller", callerName_);
        query.add("locale", Platform::current().locale().preferredLocaleIdentifier());
        get(query.url(), [completion = std::move(completion)](const HttpResponse& response) mutable {
            Result<platform::Array> entries = listOf(response, "items");
            if (!entries) return completion(entries.error());
            std::vector<StoreItem> items;
            for (const Value& entry : *entries) items.push_back(itemOf(entry));
            completion(std::move(items));
        });
    }

private:
    const std::shared_ptr<platform::StoreBag> bag_;
    const std::string callerName_;
};

}  // namespace

platform::StoreProfile Marketplace::lookupProfile() const {
    return {.name = "lookup", .version = "1", .bagKeys = {"lookup-url"}};
}

std::shared_ptr<platform::StoreBag> Marketplace::openBag(const std::string&, const std::string&) {
    return std::make_shared<Bag>(profile_.content()->storeLookupURL);
}

std::unique_ptr<platform::StoreLookup> Marketplace::makeLookup(std::shared_ptr<platform::StoreBag> bag,
                                                               std::string callerName, platform::StoreKeyProfile) {
    return std::make_unique<Lookup>(std::move(bag), std::move(callerName));
}

// Without an address, or after a failure, the history is empty.
void PurchaseHistory::runQuery(platform::PurchaseQuery query,
                               platform::OnceCallback<std::vector<platform::Purchase>> resultHandler) {
    const std::optional<std::string> address = profile_.content()->purchaseHistoryURL;
    if (!address) {
        auto none = [resultHandler = std::move(resultHandler)]() mutable { resultHandler({}); };
        return Platform::current().queues().workers(platform::Priority::UserInitiated).post(std::move(none));
    }
    Query request(*address);
    request.add("account", std::to_string(query.accountIdentifier));
    for (const std::string& identifier : query.bundleIdentifiers) request.add("bundle", identifier);
    get(request.url(), [resultHandler = std::move(resultHandler)](const HttpResponse& response) mutable {
        std::vector<platform::Purchase> purchases;
        Result<platform::Array> entries = listOf(response, "purchases");
        if (!entries) {
            log(platform::Level::Error, "purchase history: %@", entries.error());
            return resultHandler({});
        }
        for (const Value& entry : *entries)
            purchases.push_back({.bundleIdentifier = text(entry, "bundleIdentifier"),
                                 .title = text(entry, "title"),
                                 .developerName = text(entry, "developerName"),
                                 .productURL = text(entry, "productURL")});
        resultHandler(std::move(purchases));
    });
}

}  // namespace vrx::host
