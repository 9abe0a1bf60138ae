// The user's cloud accounts, their credentials and the standard headers of their requests. Each call reads the present
// state and remembers nothing. Any thread may call.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "vrx/platform/error.h"
#include "vrx/platform/http_request.h"
#include "vrx/platform/task.h"

namespace vrx::platform {

struct CloudAccount {
    std::string identifier;
    std::optional<std::string> altDSID{};  // the alternate directory identifier
};

// The account that signs requests for a cloud account.
struct AuthenticationAccount {
    std::string identifier;
    std::optional<std::string> altDSID{};
    bool operator==(const AuthenticationAccount&) const = default;
};

struct RenewalOptions {
    bool avoidUI = true;
    std::vector<std::string> services;
    bool operator==(const RenewalOptions&) const = default;
};

struct RenewalResult {
    static constexpr std::int64_t renewed = 0;  // any other code: failed
    std::int64_t code = renewed;
    MaybeError error{};
};

class AccountStore {
public:
    virtual ~AccountStore() = default;
    // Null when the user is signed out.
    virtual std::optional<CloudAccount> primaryCloudAccount() const = 0;
    virtual std::optional<AuthenticationAccount> authenticationAccount(const CloudAccount& account) const = 0;
    // The token of the stored credential for a service; null when none is stored.
    virtual std::optional<std::string> credentialToken(const AuthenticationAccount& account,
                                                       std::string_view service) const = 0;
    // Completes once, on a thread of its own, never before this call has returned. A renewed token is stored before the
    // completion runs.
    virtual void renewCredentials(const AuthenticationAccount& account, RenewalOptions options,
                                  OnceCallback<RenewalResult> completion) = 0;
    // The storefront and the identifier of the media-store account that belongs to a cloud account.
    virtual std::optional<std::string> storefront(const CloudAccount& account) const = 0;
    virtual std::optional<std::int64_t> storeAccountIdentifier(const CloudAccount& account) const = 0;
};

// The headers that account services expect of every request. The platform decides their names and values.
class AccountSession {
public:
    virtual ~AccountSession() = default;
    virtual void addClientInformationHeader(HttpRequest& request) const = 0;
    virtual void addDeviceIdentifierHeader(HttpRequest& request) const = 0;
    virtual HttpHeaders accountHeaders(const HttpRequest& request) const = 0;
};

}  // namespace vrx::platform
