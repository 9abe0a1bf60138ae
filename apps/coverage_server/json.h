// JSON as this program writes it: members in the order in which they were set, bytes that are not UTF-8 replaced.
#pragma once

#include <nlohmann/json.hpp>
#include <string>

namespace vrx::coverage_server {

using Json = nlohmann::ordered_json;

inline std::string dumped(const Json& json, int indent = -1) {
    return json.dump(indent, ' ', false, Json::error_handler_t::replace);
}

}  // namespace vrx::coverage_server
