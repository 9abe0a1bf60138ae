// What the user's store account has bought. Any thread may ask.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "vrx/platform/task.h"

namespace vrx::platform {

struct PurchaseQuery {
    std::int64_t accountIdentifier = 0;  // of the store account; 0 for none
    std::vector<std::string> bundleIdentifiers{};
};

struct Purchase {
    std::optional<std::string> bundleIdentifier{};
    std::optional<std::string> title{};
    std::optional<std::string> developerName{};
    std::optional<std::string> productURL{};
};

class PurchaseHistory {
public:
    virtual ~PurchaseHistory() = default;
    // Calls the handler once, at any later time, on another thread. The list is empty when the purchases are not
    // available.
    virtual void runQuery(PurchaseQuery query, OnceCallback<std::vector<Purchase>> resultHandler) = 0;
};

}  // namespace vrx::platform
