// Facts about the simulated device and its user. The test sets each of them; a fact that a service of the machine tells
// late is absent until then.
#pragma once

#include <map>
#include <optional>
#include <set>
#include <string>
#include <utility>
#include <vector>

#include "vrx/platform/device_properties.h"
#include "vrx/platform/paired_device_registry.h"
#include "vrx/platform/telephony_network_info.h"

namespace vrx::sim {

class DeviceProperties final : public platform::DeviceProperties {
public:
    std::optional<std::string> string(std::string_view key) const override {
        auto entry = strings.find(key);
        return entry == strings.end() ? std::nullopt : std::optional(entry->second);
    }
    bool isInternalInstall() const override { return isInternal; }
    std::optional<std::string> preferredContentSizeCategory() const override { return contentSizeCategory; }

    std::map<std::string, std::string, std::less<>> strings{{"SerialNumber", "SIM00000001"},
                                                            {"UserAssignedDeviceName", "Simulated Device"},
                                                            {"ProductType", "Simulated1,1"},
                                                            {"ProductVersion", "1.0"}};
    bool isInternal = false;
    std::optional<std::string> contentSizeCategory;
};

class FeatureFlags final : public platform::FeatureFlags {
public:
    bool isEnabled(std::string_view domain, std::string_view flag) const override {
        return enabled.contains({std::string(domain), std::string(flag)});
    }

    std::set<std::pair<std::string, std::string>> enabled;  // domain and flag
};

class PairedDeviceRegistry final : public platform::PairedDeviceRegistry {
public:
    std::vector<platform::PairedWatch> watches() const override { return all; }

    std::vector<platform::PairedWatch> all;
};

class TelephonyNetworkInfo final : public platform::TelephonyNetworkInfo {
public:
    std::map<std::string, platform::Carrier> serviceSubscriberCellularProviders() const override { return carriers; }
    std::string description() const override { return "simulated telephony"; }

    std::map<std::string, platform::Carrier> carriers;  // by service; empty without a SIM
};

}  // namespace vrx::sim
