// The applications of this machine, found by the bundle.toml files in the profile's application folders and one folder
// below. A bundle that others can change is ignored. Read afresh at each call; any thread may ask.
#pragma once

#include "vrx/host/profile/device_profile.h"
#include "vrx/platform/installed_apps.h"

namespace vrx::host {

class InstalledApps final : public platform::InstalledApps {
public:
    explicit InstalledApps(const DeviceProfile& profile) : profile_(profile) {}

    // Of several bundles with the identifier the first one counts, by the order of the folders and then of their names.
    platform::InstalledAppRecord record(const std::string& bundleIdentifier) const override;

    // Why bundles in the folders are not taken for applications. For tools.
    std::vector<std::string> problems() const;

private:
    const DeviceProfile& profile_;
};

}  // namespace vrx::host
