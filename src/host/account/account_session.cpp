#include "vrx/host/account/account_session.h"

#include "vrx/platform/sha256_hash.h"
#include "vrx/platform/vendor.h"

namespace vrx::host {

using platform::HttpHeaders;
using platform::HttpRequest;

// PRODUCT-TYPE (VERSION) AGENT
void AccountSession::addClientInformationHeader(HttpRequest& request) const {
    const std::shared_ptr<const ProfileContent> content = profile_.content();
    if (!content->account) return;
    request.headers["X-Orvane-Client-Info"] = content->account->clientInformation.value_or(
        profile_.string("ProductType").value_or("") + " (" + profile_.string("ProductVersion").value_or("") + ") " +
        platform::vendorIdentifier(platform::serviceNameRemainder));
}

// Identifies the device without revealing its serial number.
void AccountSession::addDeviceIdentifierHeader(HttpRequest& request) const {
    const std::shared_ptr<const ProfileContent> content = profile_.content();
    if (!content->account) return;
    std::optional<std::string> identifier = content->account->deviceIdentifier;
    if (!identifier)
        if (const std::optional<std::string> serialNumber = profile_.string("SerialNumber"))
            identifier = platform::sha256Hash("device identifier of " + *serialNumber);
    if (identifier) request.headers["X-Orvane-Device-Id"] = *identifier;
}

HttpHeaders AccountSession::accountHeaders(const HttpRequest&) const {
    const std::shared_ptr<const ProfileContent> content = profile_.content();
    if (!content->account) return {};
    return content->account->headers.value_or(HttpHeaders{{"X-Orvane-Account-Id", content->account->identifier}});
}

}  // namespace vrx::host
