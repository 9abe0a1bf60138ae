// The store's content: a JSON file, read for each question, with the entries of both kinds of answer:
//
//     {"items": [{"bundleIdentifier": …, "displayName": …, …}, …], "purchases": [{"bundleIdentifier": …, …}, …]}
//
// An entry is sent unchanged when the question names its bundleIdentifier, or an item's itemIdentifier. A purchase with
// an account belongs to the account of that number, one without to every account. Any thread may read.
#pragma once

#include <filesystem>

#include "coverage_server/json.h"
#include "coverage_server/store_request.h"

namespace vrx::coverage_server {

class StoreFile {
public:
    // Without a file, the store offers one support app, and nobody has bought anything.
    explicit StoreFile(std::filesystem::path file) : file_(std::move(file)) {}

    // The answers. Both throw std::runtime_error when the file cannot be read or is not as above. A missing list counts
    // as empty.
    Json items(const StoreQuestion& question) const;
    Json purchases(const StoreQuestion& question) const;

private:
    Json entries(const char* list) const;

    const std::filesystem::path file_;
};

}  // namespace vrx::coverage_server
