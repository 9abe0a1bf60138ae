// The user's cloud accounts. Any thread may ask.
#pragma once

#include <optional>
#include <string>

namespace vrx::platform {

struct CloudAccount {
    std::string identifier;
};

class AccountStore {
public:
    virtual ~AccountStore() = default;
    // Nothing when the user is signed out.
    virtual std::optional<CloudAccount> primaryCloudAccount() const = 0;
};

}  // namespace vrx::platform
