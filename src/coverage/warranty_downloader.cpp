#include "coverage/warranty_downloader.h"

#include "coverage/cache_metadata.h"
#include "coverage/warranty.h"
#include "platform/clock.h"
#include "platform/defaults_store.h"
#include "platform/files.h"
#include "platform/locale.h"
#include "platform/log.h"
#include "platform/platform.h"
#include "platform/property_list.h"
#include "platform/queue.h"
#include "platform/text.h"
#include "serverversion/server_version_utilities.h"

namespace vrx {

using platform::Data;
using platform::Level;
using platform::Platform;
using platform::Result;
using platform::Url;
using platform::Value;

namespace {

constexpr std::string_view warrantyURLKey = "WarrantyURL";

// The file's content; nothing when it cannot be read or is empty.
std::optional<Data> dataAt(const Url& url) {
    std::optional<std::string> path = url.filePath();
    if (!path) return std::nullopt;
    Result<Data> data = Platform::current().files().read(*path);
    if (!data || data->empty()) return std::nullopt;
    return std::move(data).value();
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
    VRXServerVersionUtilities::serverVersionSupported(
        [self = shared_from_this(), serialNumber, completion = std::move(completionHandler)](bool isSupported) mutable {
            if (!isSupported) {
                log(Level::Default, "Warranty download skipped server due to server version");
                completion(false, nullptr);
            } else if (!serialNumber) {
                log(Level::Error, "vrxagent failed to load warranty");
                completion(false, nullptr);
            } else {
                self->_downloadWarrantyForSerialNumber(*serialNumber, std::move(completion));
            }
        });
}

void VRXWarrantyDownloader::_downloadWarrantyForSerialNumber(const std::string& serialNumber, Completion completion) {
    std::optional<Url> url = Url::parse(Platform::current().defaultsStore().string(warrantyURLKey).value_or(""));
    Value coverage;
    if (url && url->isFile()) coverage = dictionaryFromURL(*url, serialNumber);
    finish(serialNumber, std::move(coverage), std::move(completion));
}

void VRXWarrantyDownloader::finish(const std::string& serialNumber, Value coverage, Completion completion) const {
    auto buildAndCache = [self = shared_from_this(), serialNumber, coverage = std::move(coverage),
                          completion = std::move(completion)]() mutable {
        // An answer of another kind than an object holds no coverage.
        if (!coverage.asDictionary()) {
            log(Level::Error, "vrxagent failed to load warranty");
            return completion(false, nullptr);
        }
        log(Level::Default, "downloaded warranty: %@", coverage);
        auto warranty = VRXWarranty::warrantyWithDictionary(coverage);
        storeInCache(*warranty, serialNumber);
        completion(true, std::move(warranty));
    };
    Platform::current().queues().workers(platform::Priority::UserInitiated).post(std::move(buildAndCache));
}

Value VRXWarrantyDownloader::dictionaryFromURL(const Url& url, const std::string& serialNumber) const {
    Url deviceUrl = url.withPathExtension(platform::filled("%@.%@", {serialNumber, url.pathExtension()}));
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
