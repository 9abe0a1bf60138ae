// Judges a question to the store, and reads it: pure functions of the request. Other parameters than these may be part
// of the address that the agent's profile names.
#pragma once

#include <httplib.h>

#include <cstdint>
#include <string>
#include <vector>

namespace vrx::coverage_server {

struct StoreQuestion {
    std::vector<std::string> bundles;  // at least one
    std::vector<std::string> items;    // of the catalogue
    std::int64_t account = 0;          // whose purchases
    std::vector<std::string> reasons;  // why it is not answered, all of them
};

StoreQuestion catalogueQuestion(const httplib::Request& request);
StoreQuestion purchasesQuestion(const httplib::Request& request);

}  // namespace vrx::coverage_server
