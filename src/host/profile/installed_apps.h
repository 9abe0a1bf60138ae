// The applications of this machine, found by the bundle.toml files in the profile's application folders and one folder
// below. A bundle that others can change is ignored. A name or vendor that the bundle.toml leaves out is the one of the
// application's AppStream metainfo or desktop file. Read afresh at each call; any thread may ask.
//
// Those alone make nothing an installed application: they also describe what is none, such as add-ons, their
// identifiers are a name space that bundles need not share, and "installed" ends the search, so that nothing else would
// be offered.
#pragma once

#include <string>
#include <utility>
#include <vector>

#include "vrx/host/profile/app_texts.h"
#include "vrx/host/profile/bundle_file.h"
#include "vrx/host/profile/device_profile.h"
#include "vrx/platform/installed_apps.h"

namespace vrx::host {

class InstalledApps final : public platform::InstalledApps {
public:
    explicit InstalledApps(const DeviceProfile& profile, std::vector<std::string> sharedFolders = host::sharedFolders())
        : profile_(profile), sharedFolders_(std::move(sharedFolders)) {}

    // Of several bundles with the identifier the first one counts, by the order of the folders and then of their names.
    platform::InstalledAppRecord record(const std::string& bundleIdentifier) const override;

    // Why bundles in the folders are not taken for applications. For tools.
    std::vector<std::string> problems() const;

private:
    platform::InstalledAppRecord recordOf(const BundleFile& bundle) const;

    const DeviceProfile& profile_;
    const std::vector<std::string> sharedFolders_;
};

}  // namespace vrx::host
