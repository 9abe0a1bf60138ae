// JSON as this program writes it: members in the order in which they were set; bytes that are not UTF-8 are replaced.
#pragma once

#include <filesystem>
#include <nlohmann/json.hpp>
#include <optional>
#include <string>

namespace vrx::coverage_server {

using Json = nlohmann::ordered_json;

inline std::string dumped(const Json& json, int indent = -1) {
    return json.dump(indent, ' ', false, Json::error_handler_t::replace);
}

// A file's content; nothing when the file cannot be opened. Throws std::runtime_error when it is not JSON.
std::optional<Json> jsonIn(const std::filesystem::path& path);

}  // namespace vrx::coverage_server
