// The texts of the companion UI bundle: LANGUAGE/TABLE.toml below the profile's companion folder, a text for each key,
// for translators to edit. The language is the preferred locale's, first with its region, then without ("de_AT", then
// "de"), then English. Read afresh at each call; any thread may ask.
#pragma once

#include "vrx/host/profile/device_profile.h"
#include "vrx/platform/localized_strings.h"

namespace vrx::host {

class LocalizedStrings final : public platform::LocalizedStrings {
public:
    explicit LocalizedStrings(const DeviceProfile& profile) : profile_(profile) {}

    std::string localizedString(std::string_view key, std::string_view defaultText,
                                std::string_view table) const override;

private:
    const DeviceProfile& profile_;
};

}  // namespace vrx::host
