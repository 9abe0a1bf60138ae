#include "coverage_server/json.h"

#include <fstream>
#include <stdexcept>

namespace vrx::coverage_server {

std::optional<Json> jsonIn(const std::filesystem::path& path) {
    std::ifstream file(path, std::ios::binary);
    if (!file) return std::nullopt;
    Json json = Json::parse(file, nullptr, false);
    if (json.is_discarded()) throw std::runtime_error(path.string() + " is not JSON");
    return json;
}

}  // namespace vrx::coverage_server
