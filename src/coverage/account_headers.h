// What a request carries for the coverage server: the headers that sign it with the user's accounts, the body that asks
// for one device's coverage, and the descriptions of both for the log. Any thread may call. Signing may block its
// thread while a credential is renewed, so it belongs on a worker.
// A leading "vrx_" or "_" is spelled so on purpose; "Names" in docs/architecture.md says why.
#pragma once

#include <optional>
#include <string>

#include "vrx/platform/account_store.h"
#include "vrx/platform/http_request.h"
#include "vrx/platform/log.h"

namespace vrx {

// Signs the request. Returns false and leaves the request as it was when it cannot be signed. The credential is renewed
// when it has no token, or when forced, for example after the server has refused the token.
bool vrx_signWithAccountHeaders(platform::HttpRequest& request, bool forceReprovisioning, bool avoidUI);

// Sets method, content type and body.
void vrx_setCoverageRequestBodyWithSerialNumber(platform::HttpRequest& request, const std::string& serialNumber);

// Adds the headers of a request about an offer. "Tarn" is spelled so on purpose.
void vrx_addTarnHeadersWithOfferID(platform::HttpRequest& request, const std::string& offerID,
                                   const std::string& serialNumber);

// The header fields. A log shows the names of all and the values of those that hold no secret.
platform::RedactableText headerDescription(const platform::HttpRequest& request);
// Null when there is no body or it is not UTF-8.
std::optional<std::string> bodyDescription(const platform::HttpRequest& request);

// Adds the token of the account that signs for a cloud account. Returns false when there is none, even after a renewal.
// The calling thread waits for the renewal without limit.
bool _addKSHeadersForAccount(platform::HttpRequest& request, const platform::CloudAccount& account,
                             platform::AccountStore& store, bool forceReprovisioning, bool avoidUI);

// The value of the User-Agent header: the agent, the OS version and the device's model.
std::string _userAgent();

}  // namespace vrx
