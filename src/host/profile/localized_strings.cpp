#include "vrx/host/profile/localized_strings.h"

#include <cerrno>

#include "vrx/host/base/files.h"
#include "vrx/host/profile/toml_value.h"
#include "vrx/platform/log.h"

namespace vrx::host {

namespace {

// For "zh_Hant_TW": itself, "zh_Hant", "zh" and "en".
std::vector<std::string> languages(std::string identifier) {
    std::vector<std::string> result;
    // The identifier becomes the name of a folder.
    if (identifier.find_first_of("/.") != std::string::npos) identifier.clear();
    while (!identifier.empty()) {
        result.push_back(identifier);
        const std::size_t part = identifier.find_last_of("_-");
        identifier.resize(part == std::string::npos ? 0 : part);
    }
    result.emplace_back("en");
    return result;
}

std::optional<std::string> textIn(const std::string& path, std::string_view key) {
    platform::Result<FileContent> file = readFile(path);
    if (!file) return std::nullopt;
    const platform::Result<toml::table> table =
        parseToml(file->text(), path, {platform::error_domain::bundle, EINVAL, ""});
    if (table) return (*table)[key].value_exact<std::string>();
    log(platform::Level::Error, "%@", table.error().text);
    return std::nullopt;
}

}  // namespace

std::string LocalizedStrings::localizedString(std::string_view key, std::string_view defaultText,
                                              std::string_view table) const {
    const std::string folder = profile_.content()->companionFolder;
    for (const std::string& language : languages(profile_.preferredLocaleIdentifier()))
        if (auto text = textIn(folder + "/" + language + "/" + std::string(table) + ".toml", key)) return *text;
    return std::string(defaultText);
}

}  // namespace vrx::host
