// Facts about this device. Any thread may ask; each call reads the present fact.
#pragma once

#include <optional>
#include <string>
#include <string_view>

namespace vrx::platform {

class DeviceProperties {
public:
    virtual ~DeviceProperties() = default;
    // Keys: "SerialNumber", "UserAssignedDeviceName", "ProductType", "ProductVersion".
    virtual std::optional<std::string> string(std::string_view key) const = 0;
    // Whether the installed OS is an internal build.
    virtual bool isInternalInstall() const = 0;
    // The text-size setting of the user interface.
    virtual std::optional<std::string> preferredContentSizeCategory() const = 0;
};

class FeatureFlags {
public:
    virtual ~FeatureFlags() = default;
    virtual bool isEnabled(std::string_view domain, std::string_view flag) const = 0;
};

}  // namespace vrx::platform
