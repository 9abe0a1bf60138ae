// The device profile: who this device is, which watches are paired with it, the user's account and language, and what a
// tester wants different from the machine. Every key can be left out; the machine's own fact holds then: of its files
// and, where they say nothing, of its services. Each read returns what the profile's files say now (profile_layers.h).
// Any thread may ask.
#pragma once

#include <map>
#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <vector>

#include "vrx/host/home/kept_facts.h"
#include "vrx/host/profile/bare_machine.h"
#include "vrx/host/profile/profile_content.h"
#include "vrx/host/profile/profile_layers.h"
#include "vrx/platform/device_properties.h"
#include "vrx/platform/locale.h"
#include "vrx/platform/paired_device_registry.h"

namespace vrx::host {

class DeviceProfile final : public platform::DeviceProperties,
                            public platform::FeatureFlags,
                            public platform::PairedDeviceRegistry,
                            public platform::Locale {
public:
    // Of layers, the lowest first, as ProfileLayers takes them. Where they say nothing, facts are the machine's.
    explicit DeviceProfile(std::vector<std::string> layers, const std::string& machineRoot = "");
    // Of one file; of none, with an empty path.
    explicit DeviceProfile(const std::string& file, const std::string& machineRoot = "");

    // What the profile says now. Never null.
    std::shared_ptr<const ProfileContent> content() const { return layers_.content(); }
    // The settings that the profile presets. Never null.
    std::shared_ptr<const platform::Dictionary> defaults() const;
    const std::vector<std::string>& layers() const { return layers_.paths(); }
    std::vector<ProfileLayers::Problem> problems() const { return layers_.problems(); }
    std::vector<std::string> files() const { return layers_.files(); }
    std::vector<ProfileKey> keys() const { return layers_.keys(); }
    // A single file that was named and is not there.
    std::optional<std::string> missingFile() const;
    const BareMachine& machine() const { return machine_; }
    // Of this device or a watch, by its serial number; null when it is neither's, or has none.
    std::optional<std::string> deviceName(const std::string& serialNumber) const;
    // What the machine's services have told.
    std::shared_ptr<const ToldFacts> told() const;
    void tell(ToldFacts facts);

    // These are what string("SerialNumber") and preferredLocaleIdentifier() say where no file of the profile does.
    std::optional<MachineFact> machineSerialNumber() const;
    MachineFact machineLocaleIdentifier() const;
    std::map<std::string, platform::Carrier> carriers() const;
    // The files and folders that say what can change at any time.
    std::vector<std::string> sources() const;

    std::optional<std::string> string(std::string_view key) const override;
    bool isInternalInstall() const override;
    std::optional<std::string> preferredContentSizeCategory() const override;
    bool isEnabled(std::string_view domain, std::string_view flag) const override;
    std::vector<platform::PairedWatch> watches() const override;
    std::string preferredLocaleIdentifier() const override;
    std::string decimalText(std::uint64_t number) const override;

private:
    const ProfileLayers layers_;
    const BareMachine machine_;
    mutable std::mutex mutex_;
    std::shared_ptr<const ToldFacts> told_ = std::make_shared<const ToldFacts>();
};

}  // namespace vrx::host
