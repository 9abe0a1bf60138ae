// JSON as this program writes it: members in the order in which they were set, bytes that are not UTF-8 replaced.
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

// A file's content; nothing when there is no such file. Throws std::runtime_error for one that is not JSON.
std::optional<Json> jsonIn(const std::filesystem::path& path);

}  // namespace vrx::coverage_server
