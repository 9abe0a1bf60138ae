#include "vrx/coverage/warranty_downloader.h"

#include <chrono>

#include "vrx/coverage/account_headers.h"
#include "vrx/coverage/cache_metadata.h"
#include "vrx/coverage/records/warranty.h"
#include "vrx/platform/clock.h"
#include "vrx/platform/defaults_store.h"
#include "vrx/platform/files.h"
#include "vrx/platform/http_request.h"
#include "vrx/platform/json.h"
#include "vrx/platform/locale.h"
#include "vrx/platform/log.h"
#include "vrx/platform/platform.h"
#include "vrx/platform/process_lifecycle.h"
#include "vrx/platform/property_list.h"
#include "vrx/platform/queue.h"
#include "vrx/platform/settings_keys.h"
#include "vrx/platform/text.h"
#include "vrx/serverversion/server_version_utilities.h"

namespace vrx {

using platform::Data;
using platform::HttpRequest;
using platform::HttpResponse;
using platform::Level;
using platform::OnceCallback;
using platform::Platform;
using platform::Priority;
using platform::Result;
using platform::Url;
using platform::Value;

namespace {

constexpr std::int32_t mostRetries = 2;
constexpr platform::Duration attemptTimeout = std::chrono::seconds(30);
constexpr int ok = 200;
constexpr int unauthorized = 401;

// The file's content; null when it cannot be read or is empty.
std::optional<Data> dataAt(const Url& url) {
    std::optional<std::string> path = url.filePath();
    if (!path) return std::nullopt;
    Result<Data> data = Platform::current().files().read(*path);
    if (!data || data->empty()) return std::nullopt;
    return std::move(data).value();
}

// The JSON of an answer. Without any, the result is null and the log says why. When transport and parser both failed,
// the transport's failure is the cause.
Value jsonFrom(const HttpResponse& response) {
    Value json;
    platform::MaybeError error = response.error;
    if (response.body) {
        const auto* text = reinterpret_cast<const char*>(response.body->data());
        Result<Value> parsed = Platform::current().json().parse({text, response.body->size()});
        if (parsed)
            json = *parsed;
        else if (!error)
            error = parsed.error();
    }
    const std::string outcome = json.isNull() ? platform::describe(error) : json.description();
    log(Level::Default, "load warranty status: %ld : %@", response.status, outcome);
    return json;
}

void storeInCache(const VRXWarranty& warranty, const std::string& serialNumber) {
    Platform& platform = Platform::current();
    std::string locale = platform.locale().preferredLocaleIdentifier();
    log(Level::Default, "caching warranty for locale: '%@', version: %@", locale, currentCacheVersion);
    warranty.cacheWarranty(serialNumber);
    auto store = [&](std::string_view key, Value value) {
        platform.defaultsStore().set(cacheMetadataKey(serialNumber, key), std::move(value));
    };
    store(cachedWarrantyLastUpdatedDateKey, platform.clock().now());
    store(cachedWarrantyLocaleKey, locale);
    store(cachedWarrantyVersionKey, currentCacheVersion);
}

}  // namespace

std::shared_ptr<VRXWarrantyDownloader> VRXWarrantyDownloader::initWithCallingProcessBundleID(
    std::string callingProcessBundleID) {
    log(Level::Debug, "%s: callingProcess=%@", "-[VRXWarrantyDownloader initWithCallingProcessBundleID:]",
        callingProcessBundleID);
    return std::shared_ptr<VRXWarrantyDownloader>(new VRXWarrantyDownloader(std::move(callingProcessBundleID)));
}

void VRXWarrantyDownloader::downloadWarrantyForSerialNumber(const std::optional<std::string>& serialNumber,
                                                            Completion completionHandler) {
    log(Level::Default, "%s: %{private}@",
        "-[VRXWarrantyDownloader downloadWarrantyForSerialNumber:completionHandler:]", serialNumber);
    Platform::current().defaultsStore().remove(serverVersionCacheKey);  // so that the versions are negotiated afresh
    // Keeps the process from exiting before the completion has run.
    Completion completeInFlight =
        [work = Platform::current().processLifecycle().beginWork(), completion = std::move(completionHandler)](
            bool success, std::shared_ptr<VRXWarranty> warranty) mutable { completion(success, std::move(warranty)); };
    auto continueIfSupported = [self = shared_from_this(), serialNumber,
                                completion = std::move(completeInFlight)](bool isSupported) mutable {
        if (!isSupported) {
            log(Level::Default, "Warranty download skipped server due to server version");
            completion(false, nullptr);
        } else if (!serialNumber) {
            log(Level::Error, "vrxagent failed to load warranty");
            completion(false, nullptr);
        } else {
            self->_downloadWarrantyForSerialNumber(*serialNumber, std::move(completion));
        }
    };
    // Asked on a worker, because the first attempt runs on the thread that brings the answer, and an override is
    // answered before the call returns. The caller's thread, a connection's or the main thread, must not wait for a
    // credential's renewal.
    Platform::current()
        .queues()
        .workers(Priority::UserInitiated)
        .post([next = std::move(continueIfSupported)]() mutable {
            VRXServerVersionUtilities::serverVersionSupported(std::move(next));
        });
}

void VRXWarrantyDownloader::_downloadWarrantyForSerialNumber(const std::string& serialNumber, Completion completion) {
    auto finishWith = [self = shared_from_this(), serialNumber,
                       completion = std::move(completion)](Value coverage) mutable {
        self->finish(serialNumber, std::move(coverage), std::move(completion));
    };
    std::optional<Url> url =
        Url::parse(Platform::current().defaultsStore().string(platform::settings::warrantyURL).value_or(""));
    if (!url) return finishWith(nullptr);  // a request there would fail too, but only after renewing a credential
    if (url->isFile()) return finishWith(dictionaryFromURL(*url, serialNumber));
    _downloadWarrantyFromServerURL(*url, serialNumber, mostRetries, std::move(finishWith));
}

void VRXWarrantyDownloader::_downloadWarrantyFromServerURL(const Url& url, const std::string& serialNumber,
                                                           std::int32_t retries, OnceCallback<Value> completionBlock) {
    log(Level::Default, "%{private}@ : warranty download attempt (%d/%d)", serialNumber, mostRetries - retries,
        mostRetries);
    HttpRequest request;
    request.url = url.text();
    request.timeout = attemptTimeout;
    const bool forceReprovisioning = retries != mostRetries;  // the server has refused the token that is stored
    constexpr bool avoidUI = true;
    // Signed anew at each attempt. "load sign request" below is spelled so on purpose.
    if (!vrx_signWithAccountHeaders(request, forceReprovisioning, avoidUI)) {
        log(Level::Default, "Unable to load sign request, failing warranty download");
        return completionBlock(nullptr);
    }
    vrx_setCoverageRequestBodyWithSerialNumber(request, serialNumber);
    // The first attempt says so as well, on purpose.
    log(Level::Default, "Retrying request:");
    log(Level::Default, "Headers: %@", headerDescription(request));
    log(Level::Default, "Body: %@", bodyDescription(request));
    request.sourceApplication = callingProcessBundleID_;

    auto take = [self = shared_from_this(), url, serialNumber, retries,
                 completionBlock = std::move(completionBlock)](const HttpResponse& response) mutable {
        Value json = jsonFrom(response);
        if (response.status == unauthorized && retries > 0)
            return self->_downloadWarrantyFromServerURL(url, serialNumber, retries - 1, std::move(completionBlock));
        completionBlock(response.status == ok ? std::move(json) : Value());
    };
    Platform::current().httpSessions().shared().send(std::move(request), std::move(take));
}

void VRXWarrantyDownloader::finish(const std::string& serialNumber, Value coverage, Completion completion) const {
    auto buildAndCache = [self = shared_from_this(), serialNumber, coverage = std::move(coverage),
                          completion = std::move(completion)]() mutable {
        // An answer that is not an object holds no coverage.
        if (!coverage.asDictionary()) {
            log(Level::Error, "vrxagent failed to load warranty");
            return completion(false, nullptr);
        }
        log(Level::Default, "downloaded warranty: %@", coverage);
        auto warranty = VRXWarranty::warrantyWithDictionary(coverage);
        storeInCache(*warranty, serialNumber);
        completion(true, std::move(warranty));
    };
    Platform::current().queues().workers(Priority::UserInitiated).post(std::move(buildAndCache));
}

Value VRXWarrantyDownloader::dictionaryFromURL(const Url& url, const std::string& serialNumber) const {
    Url deviceUrl = url.withPathExtension(platform::filled("%@.%@", {serialNumber, url.pathExtension()}));
    // The device's own file first, then the URL's.
    std::optional<Data> data = dataAt(deviceUrl);
    if (data) {
        log(Level::Default, "loading warranty from: %@", deviceUrl);
    } else {
        log(Level::Default, "loading warranty from: %@", url);
        data = dataAt(url);
    }
    if (!data) {
        log(Level::Error, "URL '%@' contains no plist data", url);
        return nullptr;
    }
    Result<Value> root = Platform::current().propertyList().parse(*data);
    if (!root) {
        log(Level::Error, "Error serializing plist file from URL '%@': %@", url, root.error());
        return nullptr;
    }
    return *root;
}

}  // namespace vrx
