#include "vrx/host/profile/bundle_file.h"

#include <sys/stat.h>
#include <toml++/toml.h>
#include <unistd.h>

#include <cerrno>

#include "vrx/host/base/files.h"
#include "vrx/host/profile/toml_value.h"

namespace vrx::host {

using platform::Error;
using platform::MaybeError;
using platform::Result;

namespace {

bool isOpenToOthers(const struct stat& status) {
    if (status.st_uid != 0 && status.st_uid != geteuid()) return true;
    const bool isSticky = S_ISDIR(status.st_mode) && (status.st_mode & S_ISVTX) != 0;
    return (status.st_mode & (S_IWGRP | S_IWOTH)) != 0 && !isSticky;
}

Error notBelieved(const std::string& path) {
    return {"bundle", EPERM, path + " can be changed by others than root and the agent's user"};
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
            file.entitlements = *valueOf(*entitlements).asDictionary();
        return file;
    } catch (const toml::parse_error& error) {
        return Error{"bundle", EINVAL,
                     path + ":" + std::to_string(error.source().begin.line) + ": " + std::string(error.description())};
    }
}

}  // namespace vrx::host
