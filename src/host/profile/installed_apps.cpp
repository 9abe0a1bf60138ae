#include "vrx/host/profile/installed_apps.h"

#include <filesystem>
#include <set>

#include "vrx/host/profile/bundle_file.h"

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
            if (bundle && bundle->identifier == bundleIdentifier)
                return {.isInstalled = true, .vendorName = bundle->vendor, .localizedName = bundle->name};
        }
    }
    return {};
}

}  // namespace vrx::host
