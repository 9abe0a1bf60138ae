#include "vrx/host/profile/bundle_file.h"

#include <sys/stat.h>
#include <toml++/toml.h>
#include <unistd.h>

#include <cerrno>
#include <sstream>

#include "vrx/host/base/files.h"

namespace vrx::host {

using platform::Array;
using platform::Dictionary;
using platform::Error;
using platform::MaybeError;
using platform::Result;
using platform::Value;

namespace {

bool isOpenToOthers(const struct stat& status) {
    if (status.st_uid != 0 && status.st_uid != geteuid()) return true;
    const bool isSticky = S_ISDIR(status.st_mode) && (status.st_mode & S_ISVTX) != 0;
    return (status.st_mode & (S_IWGRP | S_IWOTH)) != 0 && !isSticky;
}

Error notBelieved(const std::string& path) {
    return {platform::error_domain::bundle, EPERM, path + " can be changed by others than root and the agent's user"};
}

// Dates and times are given as their text.
Value toValue(const toml::node& node) {
    if (const auto* flag = node.as_boolean()) return flag->get();
    if (const auto* integer = node.as_integer()) return integer->get();
    if (const auto* number = node.as_floating_point()) return number->get();
    if (const auto* text = node.as_string()) return text->get();
    if (const auto* array = node.as_array()) {
        Array elements;
        for (const toml::node& element : *array) elements.push_back(toValue(element));
        return elements;
    }
    if (const auto* table = node.as_table()) {
        Dictionary entries;
        for (const auto& [key, entry] : *table) entries[std::string(key.str())] = toValue(entry);
        return entries;
    }
    std::ostringstream text;
    node.visit([&](const auto& value) { text << value; });
    return text.str();
}

std::optional<std::string> text(const toml::table& table, const char* key) {
    return table[key].value_exact<std::string>();
}

}  // namespace

MaybeError isKeptFromOthers(const std::string& path) {
    for (std::string part = path; !part.empty(); part.resize(part.rfind('/'))) {
        struct stat status;
        if (lstat(part.c_str(), &status) != 0) return systemError("examine", part, errno);
        // Behind a link stands another path.
        if (S_ISLNK(status.st_mode) || isOpenToOthers(status)) return notBelieved(part);
    }
    return std::nullopt;
}

Result<BundleFile> readBundleFile(const std::string& folder) {
    const std::string path = folder + "/" + bundleFileName;
    Result<FileContent> content = readFile(path);
    if (!content) return content.error();
    if (isOpenToOthers(content->status)) return notBelieved(path);
    if (MaybeError error = isKeptFromOthers(path)) return *error;
    try {
        const toml::table table = toml::parse(
            std::string_view(reinterpret_cast<const char*>(content->bytes.data()), content->bytes.size()), path);
        BundleFile file;
        file.folder = folder;
        file.identifier = text(table, "identifier");
        file.name = text(table, "name");
        file.vendor = text(table, "vendor");
        file.group = text(table, "group");
        if (const toml::table* entitlements = table["entitlements"].as_table())
            file.entitlements = *toValue(*entitlements).asDictionary();
        return file;
    } catch (const toml::parse_error& error) {
        return Error{platform::error_domain::bundle, EINVAL,
                     path + ":" + std::to_string(error.source().begin.line) + ": " + std::string(error.description())};
    }
}

}  // namespace vrx::host
