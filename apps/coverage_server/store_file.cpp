#include "coverage_server/store_file.h"

#include <algorithm>
#include <stdexcept>

namespace vrx::coverage_server {

namespace {

constexpr const char* builtIn = R"({"items": [{
    "bundleIdentifier": "com.orvane.support",
    "displayName": "Orvane Support",
    "artistName": "Orvane",
    "productPageURL": "https://marketplace.orvane.example/app/orvane-support",
    "artwork": [{"url": "https://marketplace.orvane.example/artwork/orvane-support.png"}]
}]})";

bool isAmong(const Json& entry, const char* member, const std::vector<std::string>& identifiers) {
    return entry.is_object() && entry.contains(member) &&
           std::ranges::any_of(identifiers,
                               [&](const std::string& identifier) { return entry[member] == Json(identifier); });
}

}  // namespace

Json StoreFile::entries(const char* list) const {
    std::optional<Json> store = file_.empty() ? Json::parse(builtIn) : jsonIn(file_);
    if (!store) throw std::runtime_error(file_.string() + " cannot be read");
    if (!store->is_object()) throw std::runtime_error(file_.string() + " holds no object");
    Json entries = store->value(list, Json(Json::array()));
    if (!entries.is_array()) throw std::runtime_error(file_.string() + ": " + list + " is no list");
    return entries;
}

Json StoreFile::items(const StoreQuestion& question) const {
    Json found = Json::array();
    for (Json& entry : entries("items"))
        if (isAmong(entry, "bundleIdentifier", question.bundles) || isAmong(entry, "itemIdentifier", question.items))
            found.push_back(std::move(entry));
    return {{"items", found}};
}

Json StoreFile::purchases(const StoreQuestion& question) const {
    Json found = Json::array();
    for (Json& entry : entries("purchases"))
        if (isAmong(entry, "bundleIdentifier", question.bundles) &&
            (!entry.contains("account") || entry["account"] == Json(question.account)))
            found.push_back(std::move(entry));
    return {{"purchases", found}};
}

}  // namespace vrx::coverage_server
