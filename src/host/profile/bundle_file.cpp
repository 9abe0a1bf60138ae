#include "vrx/host/profile/bundle_file.h"

#include <toml++/toml.h>

#include <cerrno>

#include "vrx/host/base/files.h"
#include "vrx/host/base/trust.h"
#include "vrx/host/profile/toml_value.h"

namespace vrx::host {

using platform::Error;
using platform::Result;

namespace {

std::optional<std::string> text(const toml::table& table, const char* key) {
    return table[key].value_exact<std::string>();
}

}  // namespace

// Examines the file as it was opened and the path to it: another file may be at the path by now.
Result<BundleFile> readBundleFile(const std::string& folder) {
    const std::string path = folder + "/" + bundleFileName;
    Result<FileContent> content = readFile(path);
    if (!content) return content.error();
    if (auto open = findOpenToOthers(path, content->status)) return open->error;
    if (auto open = findOpenToOthers(path, Links::Refused)) return open->error;
    try {
        const toml::table table = toml::parse(content->text(), path);
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
        return Error{platform::error_domain::bundle, EINVAL,
                     path + ":" + std::to_string(error.source().begin.line) + ": " + std::string(error.description())};
    }
}

}  // namespace vrx::host
