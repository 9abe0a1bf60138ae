#include "vrx/serverversion/server_version_utilities.h"

#include <algorithm>
#include <cmath>
#include <iterator>

#include "vrx/platform/defaults_store.h"
#include "vrx/platform/http_request.h"
#include "vrx/platform/log.h"
#include "vrx/platform/number_text.h"
#include "vrx/platform/platform.h"
#include "vrx/platform/property_list.h"
#include "vrx/platform/settings_keys.h"
#include "vrx/platform/text.h"

namespace vrx {

using platform::DefaultsStore;
using platform::Dictionary;
using platform::HttpRequest;
using platform::HttpResponse;
using platform::Level;
using platform::Platform;
using platform::Result;
using platform::Value;

namespace {

namespace settings = platform::settings;

// The log texts in this file are spelled so on purpose: some have a space too many, and "serializing" means reading.

constexpr std::string_view serverVersionOverrideKey = "ServerVersionOverride";
constexpr std::string_view webFlowURLKey = "WebFlowURL";

using VersionSet = VRXServerVersionUtilities::VersionSet;

DefaultsStore& defaults() {
    return Platform::current().defaultsStore();
}

Value clientVersionDictionary() {
    Value dictionary =
        Dictionary{{std::string(settings::lowServerVersion), defaults().integer(settings::lowServerVersion)},
                   {std::string(settings::highServerVersion), defaults().integer(settings::highServerVersion)}};
    log(Level::Default, "Using Client version: %@", dictionary);
    return dictionary;
}

void storeServerVersionCache(const Value& dictionary) {
    defaults().set(serverVersionCacheKey, dictionary);
    log(Level::Default, "Caching Server version  %@", dictionary);
}

// A version in a version dictionary: a number as it is, a string by the integer that it begins with. Null when it is
// missing or of another type.
Value versionFrom(const Value& dictionary, std::string_view key) {
    const Value& value = dictionary[key];
    if (const std::string* text = value.asString()) return platform::leadingInteger(*text);
    // NaN has no place in an ordered set and counts as missing.
    if (auto number = value.asNumber(); number && !std::isnan(*number)) return value;
    log(Level::Error, "Server version dictionary missing key '%@'", key);
    return nullptr;
}

// The versions that the client shares with a server of the given version dictionary.
std::optional<VersionSet> versionsSharedWith(const Value& server) {
    log(Level::Default, "Server version  %@", server);
    if (server.isNull()) {
        log(Level::Error, "No server version dictionary found");
        return std::nullopt;
    }
    if (!server.asDictionary()) {
        log(Level::Error, "Incorrect serverDictionary format");
        return std::nullopt;
    }
    const Value low = versionFrom(server, settings::lowServerVersion);
    if (low.isNull()) return std::nullopt;
    const Value high = versionFrom(server, settings::highServerVersion);
    if (high.isNull()) return std::nullopt;
    VersionSet serverSet{low, high};
    log(Level::Default, "Server versions '%@'", serverSet);
    VersionSet clientSet{defaults().integer(settings::lowServerVersion),
                         defaults().integer(settings::highServerVersion)};
    log(Level::Default, "Client versions '%@'", clientSet);
    VersionSet shared;
    std::ranges::set_intersection(clientSet, serverSet, std::inserter(shared, shared.end()),
                                  VRXServerVersionUtilities::NumericOrder());
    log(Level::Default, "clientAndServerSet '%@'", shared);
    return shared;
}

// The root of the document in an answer, whatever its type; null when there is no document.
Value rootOfDocument(const std::string& url, const HttpResponse& response) {
    if (!response.body) {
        log(Level::Error, "Failed to fetch plist data from URL '%@' with error: %@", url, response.error);
        return nullptr;
    }
    Result<Value> root = Platform::current().propertyList().parse(*response.body);
    if (!root) {
        log(Level::Error, "Error serializing plist file from URL '%@': %@", url, root.error());
        return nullptr;
    }
    return *root;
}

// Whether the integer is less than the double.
bool isLess(std::int64_t integer, double number) {
    constexpr double end = 9223372036854775808.0;  // 2^63
    if (number >= end || number < -end) return number > 0;
    const auto whole = static_cast<std::int64_t>(number);
    return integer < whole || (integer == whole && number > static_cast<double>(whole));
}

}  // namespace

bool VRXServerVersionUtilities::NumericOrder::operator()(const Value& one, const Value& other) const {
    const auto oneInteger = one.asInteger();
    const auto otherInteger = other.asInteger();
    if (oneInteger && otherInteger) return *oneInteger < *otherInteger;
    const double oneNumber = one.asNumber().value_or(0);
    const double otherNumber = other.asNumber().value_or(0);
    if (oneInteger) return isLess(*oneInteger, otherNumber);
    if (otherInteger) return one != other && !isLess(*otherInteger, oneNumber);
    return oneNumber < otherNumber;
}

void VRXServerVersionUtilities::_dictionaryFromURL(std::string url, bool shouldRetry, Completion<Value> completion) {
    auto& sessions = Platform::current().httpSessions();
    // The second attempt goes past the caches: they may hold the document that is not a dictionary.
    auto uncached = shouldRetry ? nullptr : sessions.makeUncached();
    platform::HttpSession& session = shouldRetry ? sessions.shared() : *uncached;
    HttpRequest request;
    request.url = url;
    session.send(std::move(request), [url = std::move(url), shouldRetry,
                                      completion = std::move(completion)](HttpResponse response) mutable {
        Value root = rootOfDocument(url, response);
        if (root.isNull() || root.asDictionary()) {
            completion(root);
        } else if (shouldRetry) {
            log(Level::Error, "Incorrect format in response detected. retrying...");
            _dictionaryFromURL(url, false, std::move(completion));
        } else {
            log(Level::Error,
                "Incorrect format in response detected from URL '%@'. Response: %@. Aborting without retry.", url,
                root);
            completion(nullptr);
        }
    });
}

Value VRXServerVersionUtilities::_getValidServerVersionCache() {
    Value cache = defaults().get(serverVersionCacheKey);
    if (cache.isNull() || cache.asDictionary()) return cache;
    log(Level::Error, "Incorrect format stored in server version cache. Removing it.");
    defaults().remove(serverVersionCacheKey);
    return nullptr;
}

void VRXServerVersionUtilities::_supportedVersionsForClientAndServer(VRXServerLookupPolicy policy,
                                                                     Completion<std::optional<VersionSet>> completion) {
    Value override = defaults().get(serverVersionOverrideKey);
    log(Level::Default, " Server lookup policy:%ld", policy);
    if (!override.isNull()) {
        log(Level::Default, "Using Overridden Server version  %@", override);
        defaults().set(serverVersionCacheKey, override);
        return completion(versionsSharedWith(override));
    }

    Value cache = _getValidServerVersionCache();
    const bool isRefresh = policy == VRXServerLookupPolicyRefresh;
    if (policy == VRXServerLookupPolicyLocal) {
        if (cache.isNull()) return completion(versionsSharedWith(clientVersionDictionary()));
        log(Level::Default, "Using Cached Server version: %@", cache);
        return completion(versionsSharedWith(cache));
    }
    if (!isRefresh && !cache.isNull()) return completion(versionsSharedWith(cache));

    // A refresh stores whatever it uses. A default lookup stores only what it fetched, so that the next one asks again.
    auto finish = [isRefresh, cache, completion = std::move(completion)](Value fetched) mutable {
        Value used = !fetched.isNull() ? fetched : !cache.isNull() ? cache : clientVersionDictionary();
        if (isRefresh || !fetched.isNull()) storeServerVersionCache(used);
        completion(versionsSharedWith(used));
    };
    _dictionaryFromURL(defaults().string(settings::serverVersionURL).value_or(""), true, std::move(finish));
}

void VRXServerVersionUtilities::serverVersionSupported(Completion<bool> completion) {
    auto answer = [completion = std::move(completion)](const std::optional<VersionSet>& shared) mutable {
        const bool isSupported = shared && !shared->empty();
        if (isSupported) log(Level::Default, "Server version supported by client version - '%@'", *shared);
        completion(isSupported);
    };
    _supportedVersionsForClientAndServer(VRXServerLookupPolicyRefresh, std::move(answer));
}

void VRXServerVersionUtilities::isHighServerVersionFeaturesetEnabled(VRXServerLookupPolicy policy,
                                                                     Completion<bool> completion) {
    auto answer = [completion = std::move(completion)](const std::optional<VersionSet>& shared) mutable {
        const bool isEnabled = shared && shared->contains(defaults().integer(settings::highServerVersion));
        log(Level::Default, "High Server version supported - %@", isEnabled ? "YES" : "NO");
        completion(isEnabled);
    };
    _supportedVersionsForClientAndServer(policy, std::move(answer));
}

void VRXServerVersionUtilities::isHighServerVersionFeaturesetEnabled(Completion<bool> completion) {
    isHighServerVersionFeaturesetEnabled(VRXServerLookupPolicyDefault, std::move(completion));
}

bool VRXServerVersionUtilities::isHighServerVersionFeaturesetEnabled() {
    bool isEnabled = false;  // set before the call returns: a local lookup never waits
    isHighServerVersionFeaturesetEnabled(VRXServerLookupPolicyLocal, [&isEnabled](bool answer) { isEnabled = answer; });
    return isEnabled;
}

Value VRXServerVersionUtilities::readWebURLOverride() {
    log(Level::Default, "%s", "+[VRXServerVersionUtilities readWebURLOverride]");
    return defaults().get(webFlowURLKey);
}

}  // namespace vrx
