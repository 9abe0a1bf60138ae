// The watches this user has or had. Any thread may ask; each call reads the registry afresh.
#pragma once

#include <optional>
#include <string>
#include <vector>

#include "vrx/platform/date.h"

namespace vrx::platform {

struct PairedWatch {
    std::optional<std::string> name;
    std::optional<std::string> localizedModelName;
    std::optional<std::string> serialNumber;
    std::optional<Date> pairedDate;
    bool isPaired = false;
    bool isArchived = false;

    // Paired now, not only in the past.
    bool isActive() const { return isPaired && !isArchived; }
    // The user's name for the watch, else its model's name.
    const std::optional<std::string>& displayName() const { return name ? name : localizedModelName; }
    std::string description() const { return name.value_or("(null)") + " (" + serialNumber.value_or("(null)") + ")"; }
};

class PairedDeviceRegistry {
public:
    virtual ~PairedDeviceRegistry() = default;
    // Every known watch, archived ones and those of alternate accounts included.
    virtual std::vector<PairedWatch> watches() const = 0;
};

}  // namespace vrx::platform
