// The tokens of the user's accounts: each in a file of its own in the agent's home, credentials/HASH, where HASH is the
// SHA-256 of the account's identifier, a line end and the service. A file holds the token and nothing else, is read
// afresh each time, and counts only while it is the agent's alone. Tokens are never logged. Any thread may use it.
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
    // Replaces the token as a whole, or leaves the one before.
    platform::MaybeError store(const std::string& account, std::string_view service, std::string_view token);

private:
    std::string pathOf(const std::string& account, std::string_view service) const;

    const std::string folder_;
};

// Whether the text can be a token: it becomes the value of a header.
bool isToken(std::string_view text);

}  // namespace vrx::host
