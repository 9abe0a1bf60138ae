// The tokens of the user's accounts, each in a file of its own in the agent's home, credentials/HASH. HASH is the
// SHA-256 of the account's identifier, a line end and the service. The file holds nothing but the token. It is read at
// each call, and ignored unless it belongs to the agent's user and only that user can read it. Tokens are never logged.
// Any thread may use it.
#pragma once

#include <optional>
#include <string>
#include <string_view>

#include "vrx/platform/error.h"

namespace vrx::host {

class Credentials {
public:
    explicit Credentials(const std::string& home) : folder_(home + "/credentials") {}

    std::optional<std::string> token(const std::string& account, std::string_view service) const;
    // Replaces the token as a whole, or keeps the old one.
    platform::MaybeError store(const std::string& account, std::string_view service, std::string_view token);

private:
    std::string pathOf(const std::string& account, std::string_view service) const;

    const std::string folder_;
};

// Whether the text can be a token, which becomes the value of a header.
bool isToken(std::string_view text);

}  // namespace vrx::host
