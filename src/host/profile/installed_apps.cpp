#include "vrx/host/profile/installed_apps.h"

#include <cerrno>
#include <filesystem>
#include <set>

#include "vrx/platform/log.h"

namespace vrx::host {

using platform::InstalledAppRecord;

namespace {

// The folder itself, and the folders in it by name.
std::vector<std::string> candidates(const std::string& folder) {
    std::set<std::string> inner;
    std::error_code error;
    for (std::filesystem::directory_iterator entry(folder, error), end; !error && entry != end;
         entry.increment(error)) {
        std::error_code ignored;
        if (entry->is_directory(ignored)) inner.insert(entry->path().string());
    }
    std::vector<std::string> all{folder};
    all.insert(all.end(), inner.begin(), inner.end());
    return all;
}

}  // namespace

InstalledAppRecord InstalledApps::record(const std::string& bundleIdentifier) const {
    const std::shared_ptr<const ProfileContent> content = profile_.content();
    for (const std::string& folder : content->applicationFolders) {
        for (const std::string& candidate : candidates(folder)) {
            platform::Result<BundleFile> bundle = readBundleFile(candidate);
            if (bundle && bundle->identifier == bundleIdentifier) return recordOf(*bundle);
            if (!bundle && bundle.error().code != ENOENT)
                log(platform::Level::Default, "Not taken for an installed application: %@", bundle.error().text);
        }
    }
    return {};
}

InstalledAppRecord InstalledApps::recordOf(const BundleFile& bundle) const {
    InstalledAppRecord record{.isInstalled = true, .vendorName = bundle.vendor, .localizedName = bundle.name};
    if (record.vendorName && record.localizedName) return record;
    const AppTexts texts = readAppTexts(*bundle.identifier, profile_.preferredLocaleIdentifier(), sharedFolders_);
    if (!record.vendorName) record.vendorName = texts.vendor;
    if (!record.localizedName) record.localizedName = texts.name;
    return record;
}

std::vector<std::string> InstalledApps::problems() const {
    const std::shared_ptr<const ProfileContent> content = profile_.content();
    std::vector<std::string> texts;
    for (const std::string& folder : content->applicationFolders)
        for (const std::string& candidate : candidates(folder))
            if (auto bundle = readBundleFile(candidate); !bundle && bundle.error().code != ENOENT)
                texts.push_back(bundle.error().text);
    return texts;
}

}  // namespace vrx::host
