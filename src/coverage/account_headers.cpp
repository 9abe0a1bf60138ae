#include "vrx/coverage/account_headers.h"

#include <algorithm>
#include <chrono>
#include <cstdint>
#include <set>
#include <string_view>

#include "vrx/platform/clock.h"
#include "vrx/platform/defaults_store.h"
#include "vrx/platform/device_properties.h"
#include "vrx/platform/json.h"
#include "vrx/platform/locale.h"
#include "vrx/platform/number_text.h"
#include "vrx/platform/platform.h"
#include "vrx/platform/queue.h"
#include "vrx/platform/text.h"
#include "vrx/platform/utf8.h"
#include "vrx/platform/uuid.h"
#include "vrx/platform/value.h"
#include "vrx/platform/vendor.h"

namespace vrx {

using platform::AccountStore;
using platform::AuthenticationAccount;
using platform::CloudAccount;
using platform::Dictionary;
using platform::HttpRequest;
using platform::Level;
using platform::Platform;
using platform::RenewalResult;

namespace {

constexpr std::string_view keystoneServiceRemainder = ".ks.supportapp.auth";

constexpr const char* contentTypeHeader = "Content-Type";
constexpr const char* tokenHeader = "X-Orvane-KS-Token";
constexpr const char* altDSIDHeader = "altDSID";
constexpr const char* userAgentHeader = "User-Agent";
constexpr const char* storefrontHeader =
    "storefrontLocale";  // also the defaults key of a value that replaces the account's

// A null value removes the header.
void setHeader(HttpRequest& request, const char* name, const std::optional<std::string>& value) {
    if (value)
        request.headers[name] = *value;
    else
        request.headers.erase(name);
}

// The token after a renewal: the renewed one, or the earlier one when the renewal failed.
std::optional<std::string> tokenAfterRenewal(AccountStore& store, const AuthenticationAccount& account,
                                             const std::string& service, std::optional<std::string> token,
                                             bool avoidUI) {
    log(Level::Default, "Reprovision KS tokens");
    auto hasEnded = Platform::current().queues().makeEvent();
    // The completion may refer to this stack: the wait ends only by the completion's last step.
    auto takeToken = [&, hasEnded](const RenewalResult& result) {
        if (result.code == RenewalResult::renewed)
            token = store.credentialToken(account, service);
        else
            log(Level::Error, "No way to sign request with KS token because renewal of KS credential failed: %ld, %@",
                result.code, result.error);
        hasEnded->set();
    };
    store.renewCredentials(account, {.avoidUI = avoidUI, .services = {service}}, takeToken);
    hasEnded->wait();
    return token;
}

// The storefront in the defaults, which replaces the account's; null when none is set.
std::optional<std::string> storefrontOverride() {
    return Platform::current().defaultsStore().string(storefrontHeader);
}

// Sets and logs the storefront. Each set of headers calls it once and so logs one line.
void setStorefront(HttpRequest& request, const std::optional<std::string>& storefront) {
    setHeader(request, storefrontHeader, storefront);
    log(Level::Default, "storeLocale %@", storefront);
}

// Milliseconds since 1970, without a fraction; 0 when the clock stands before 1970.
std::int64_t timestamp(platform::Date date) {
    return std::max<std::int64_t>(0, platform::clampedInteger(platform::epochSeconds(date) * 1000.0));
}

// Whole hours east of GMT, rounded towards zero.
std::int32_t hours(std::chrono::seconds timeZoneOffset) {
    return static_cast<std::int32_t>(std::chrono::duration_cast<std::chrono::hours>(timeZoneOffset).count());
}

// The token is a secret, and so may be any header that account services add. A log shows only the headers that are
// known to hold none.
bool isShownInLogs(const std::string& header) {
    static const std::set<std::string_view, platform::HeaderNameOrder> shown{contentTypeHeader, altDSIDHeader,
                                                                             userAgentHeader, storefrontHeader};
    return shown.contains(header);
}

}  // namespace

bool vrx_signWithAccountHeaders(HttpRequest& request, bool forceReprovisioning, bool avoidUI) {
    Platform& platform = Platform::current();
    AccountStore& store = platform.accountStore();
    std::optional<CloudAccount> account = store.primaryCloudAccount();
    if (!account) {
        log(Level::Default, "No primary Nimbus account, can't sign this request");
        return false;
    }
    // The token comes first: without one, the request stays as it was.
    if (!_addKSHeadersForAccount(request, *account, store, forceReprovisioning, avoidUI)) {
        log(Level::Default, "Failed to add KS headers, can't sign this request");
        return false;
    }
    platform.accountSession().addClientInformationHeader(request);
    platform.accountSession().addDeviceIdentifierHeader(request);
    for (const auto& [name, value] : platform.accountSession().accountHeaders(request)) request.headers[name] = value;
    setHeader(request, altDSIDHeader, account->altDSID);
    setHeader(request, userAgentHeader, _userAgent());

    std::optional<std::string> storefront = storefrontOverride();
    if (!storefront) storefront = store.storefront(*account);
    setStorefront(request, storefront);
    return true;
}

bool _addKSHeadersForAccount(HttpRequest& request, const CloudAccount& account, AccountStore& store,
                             bool forceReprovisioning, bool avoidUI) {
    std::optional<AuthenticationAccount> keystoneAccount = store.authenticationAccount(account);
    if (!keystoneAccount) {
        log(Level::Default, "Keystone signing failed because no KS account was provided.");
        return false;
    }
    if (!keystoneAccount->altDSID) {
        // The text is spelled so on purpose.
        log(Level::Error, "Keystone signing failed because no there's no altDSID on the account.");
        return false;
    }
    const std::string service = platform::vendorIdentifier(keystoneServiceRemainder);
    std::optional<std::string> token = store.credentialToken(*keystoneAccount, service);
    if (!token || forceReprovisioning) {
        token = tokenAfterRenewal(store, *keystoneAccount, service, std::move(token), avoidUI);
        if (!token) {
            log(Level::Default, "Error: still no KS token even after calling renewCredentialsForAccount.");
            return false;
        }
    }
    setHeader(request, tokenHeader, token);
    return true;
}

void vrx_setCoverageRequestBodyWithSerialNumber(HttpRequest& request, const std::string& serialNumber) {
    Platform& platform = Platform::current();
    request.method = "POST";
    setHeader(request, contentTypeHeader, "application/json");
    const Dictionary body{
        {"serialNumber", serialNumber},
        {"locale", platform.locale().preferredLocaleIdentifier()},
        {"requestTimestamp", timestamp(platform.clock().now())},
        {"requestTimezone", hours(platform.clock().timeZoneOffset())},
    };
    // Fails only for a serial number that is not UTF-8. The request then has no body, and the server refuses it.
    if (auto json = platform.json().serialize(body)) request.body.assign(json->begin(), json->end());
}

void vrx_addTarnHeadersWithOfferID(HttpRequest& request, const std::string& offerID, const std::string& serialNumber) {
    Platform& platform = Platform::current();
    setHeader(request, "X-Orvane-SN", serialNumber);
    setHeader(request, "X-Orvane-Txn-ID", platform.uuidSource().makeUuid());
    setHeader(request, "X-Orvane-Content-Size", platform.deviceProperties().preferredContentSizeCategory());
    setHeader(request, "X-Orvane-DM", "No");
    setHeader(request, userAgentHeader, _userAgent());
    setHeader(request, "Offer-ID", offerID);

    std::optional<std::string> storefront = storefrontOverride();
    if (!storefront) {
        AccountStore& store = platform.accountStore();
        if (std::optional<CloudAccount> account = store.primaryCloudAccount())
            storefront = store.storefront(*account);
        else
            log(Level::Error, "Primary Nimbus Account is nil!");
    }
    setStorefront(request, storefront);
}

platform::RedactableText headerDescription(const HttpRequest& request) {
    platform::HttpHeaders redacted = request.headers;
    for (auto& [name, value] : redacted)
        if (!isShownInLogs(name)) value = platform::redactedMark;
    return {platform::describe(request.headers), platform::describe(redacted)};
}

std::optional<std::string> bodyDescription(const HttpRequest& request) {
    std::string text(request.body.begin(), request.body.end());
    if (text.empty() || !platform::isUtf8(text)) return std::nullopt;
    return text;
}

// A fact that the device does not know reads (null), as it does in the log.
std::string _userAgent() {
    const platform::DeviceProperties& device = Platform::current().deviceProperties();
    const std::string version = platform::describe(device.string("ProductVersion"));
    const std::string type = platform::describe(device.string("ProductType"));
    return platform::filled("<%@/%@/%@>", {platform::vendorIdentifier(platform::serviceNameRemainder), version, type});
}

}  // namespace vrx
