// The simulated user's accounts. The test sets each fact. Renewals answer as scripted and are recorded.
#pragma once

#include <cstdint>
#include <map>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "vrx/platform/account_store.h"
#include "vrx/platform/queue.h"
#include "vrx/sim/interference.h"

namespace vrx::sim {

class AccountStore final : public platform::AccountStore {
public:
    AccountStore(platform::Queues& queues, const Interference& interference)
        : renewals_(queues.makeSerialQueue("renewal")), interference_(interference) {}

    std::optional<platform::CloudAccount> primaryCloudAccount() const override { return primary; }
    std::optional<platform::AuthenticationAccount> authenticationAccount(const platform::CloudAccount&) const override {
        return authentication;
    }
    std::optional<std::string> credentialToken(const platform::AuthenticationAccount&,
                                               std::string_view service) const override {
        auto token = tokens.find(service);
        return token == tokens.end() ? std::nullopt : std::optional(token->second);
    }
    void renewCredentials(const platform::AuthenticationAccount&, platform::RenewalOptions options,
                          platform::OnceCallback<platform::RenewalResult> completion) override {
        interference_.call();
        asked.push_back(options);
        renewals_->postAfter(
            renewalDelay, [this, services = std::move(options.services), completion = std::move(completion)]() mutable {
                if (renewalResult.code == platform::RenewalResult::renewed && renewedToken)
                    for (const std::string& service : services) tokens[service] = *renewedToken;
                completion(renewalResult);
            });
    }
    std::optional<std::string> storefront(const platform::CloudAccount&) const override { return mediaStorefront; }
    std::optional<std::int64_t> storeAccountIdentifier(const platform::CloudAccount&) const override {
        return mediaAccountIdentifier;
    }

    std::optional<platform::CloudAccount> primary = platform::CloudAccount{"user@cloud", "ALT-1"};  // signed in
    std::optional<platform::AuthenticationAccount> authentication =
        platform::AuthenticationAccount{"user@cloud", "ALT-1"};
    std::map<std::string, std::string, std::less<>> tokens;  // by service
    std::optional<std::string> mediaStorefront;
    std::optional<std::int64_t> mediaAccountIdentifier;

    // What a renewal answers, after which delay, and the token that it stores when it succeeds.
    platform::RenewalResult renewalResult{};
    platform::Duration renewalDelay{1.0};
    std::optional<std::string> renewedToken;
    std::vector<platform::RenewalOptions> asked;  // in order

private:
    std::shared_ptr<platform::Queue> renewals_;  // completions come on a thread of their own
    const Interference& interference_;
};

class AccountSession final : public platform::AccountSession {
public:
    void addClientInformationHeader(platform::HttpRequest& request) const override {
        request.headers["X-Orvane-Client-Info"] = "simulated";
    }
    void addDeviceIdentifierHeader(platform::HttpRequest& request) const override {
        request.headers["X-Orvane-Device-Id"] = "SIM-DEVICE";
    }
    platform::HttpHeaders accountHeaders(const platform::HttpRequest&) const override { return headers; }

    platform::HttpHeaders headers;
};

}  // namespace vrx::sim
