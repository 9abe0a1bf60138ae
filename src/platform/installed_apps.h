// The applications on this device. Any thread may ask; each call reads the present state.
#pragma once

#include <optional>
#include <string>

namespace vrx::platform {

struct InstalledAppRecord {
    bool isInstalled = false;
    std::optional<std::string> vendorName{};
    std::optional<std::string> localizedName{};
};

class InstalledApps {
public:
    virtual ~InstalledApps() = default;
    virtual InstalledAppRecord record(const std::string& bundleIdentifier) const = 0;
};

}  // namespace vrx::platform
