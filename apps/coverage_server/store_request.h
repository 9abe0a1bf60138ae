// Reads and judges a question to the store: pure functions of the request. Unknown parameters are allowed, because the
// store's address in the agent's profile may have some.
#pragma once

#include <httplib.h>

#include <cstdint>
#include <string>
#include <vector>

namespace vrx::coverage_server {

struct StoreQuestion {
    std::vector<std::string> bundles;  // at least one
    std::vector<std::string> items;    // of the catalogue
    std::int64_t account = 0;          // of the purchases
    std::vector<std::string> reasons;  // all the reasons why it is not answered
};

StoreQuestion catalogueQuestion(const httplib::Request& request);
StoreQuestion purchasesQuestion(const httplib::Request& request);

}  // namespace vrx::coverage_server
