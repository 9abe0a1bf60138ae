#include "vrx/host/profile/bundle_file.h"

#include <cerrno>

#include "vrx/host/base/files.h"
#include "vrx/host/base/trust.h"
#include "vrx/host/profile/toml_value.h"

namespace vrx::host {

using platform::Result;

namespace {

std::optional<std::string> text(const toml::table& table, const char* key) {
    return table[key].value_exact<std::string>();
}

}  // namespace

Result<BundleFile> parseBundleFile(std::string_view document, const std::string& folder) {
    const Result<toml::table> parsed =
        parseToml(document, folder + "/" + bundleFileName, {platform::error_domain::bundle, EINVAL, ""});
    if (!parsed) return parsed.error();
    const toml::table& table = *parsed;
    BundleFile file;
    file.folder = folder;
    file.identifier = text(table, "identifier");
    file.name = text(table, "name");
    file.vendor = text(table, "vendor");
    file.group = text(table, "group");
    if (const toml::table* entitlements = table["entitlements"].as_table())
        file.entitlements = *valueOf(*entitlements).asDictionary();
    return file;
}

// Examines the file as it was opened and the path to it: another file may be at the path by now.
Result<BundleFile> readBundleFile(const std::string& folder) {
    const std::string path = folder + "/" + bundleFileName;
    Result<FileContent> content = readFile(path);
    if (!content) return content.error();
    if (auto open = findOpenToOthers(path, content->status)) return open->error;
    if (auto open = findOpenToOthers(path, Links::Refused)) return open->error;
    return parseBundleFile(content->text(), folder);
}

}  // namespace vrx::host
