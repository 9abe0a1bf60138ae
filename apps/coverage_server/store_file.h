// What the store has: a JSON file, read afresh for each question, with the entries of both of its answers:
//
//     {"items": [{"bundleIdentifier": …, "displayName": …, …}, …], "purchases": [{"bundleIdentifier": …, …}, …]}
//
// An entry is sent as it stands when it has an identifier that was asked for: its bundleIdentifier, or an item its
// itemIdentifier. A purchase with a number as its account is that account's; one without is everybody's.
// Any thread may read.
#pragma once

#include <filesystem>

#include "coverage_server/json.h"
#include "coverage_server/store_request.h"

namespace vrx::coverage_server {

class StoreFile {
public:
    // Without a file the store offers one support app, and nobody has bought anything.
    explicit StoreFile(std::filesystem::path file) : file_(std::move(file)) {}

    // The answers. Both throw std::runtime_error when the file cannot be read as described; a list may be missing.
    Json items(const StoreQuestion& question) const;
    Json purchases(const StoreQuestion& question) const;

private:
    Json entries(const char* list) const;

    const std::filesystem::path file_;
};

}  // namespace vrx::coverage_server
