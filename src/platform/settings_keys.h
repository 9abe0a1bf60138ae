// The settings keys that several parts of the agent use. A key that only one part uses is declared in that part.
#pragma once

#include <string_view>

namespace vrx::platform::settings {

// These keys have a registered value, which holds while none is stored. Durations are in seconds.
inline constexpr std::string_view cachedWarrantyValidityDuration = "CachedWarrantyValidityDuration";
inline constexpr std::string_view highServerVersion = "HighServerVersion";
inline constexpr std::string_view lowServerVersion = "LowServerVersion";
inline constexpr std::string_view oneDayInterval = "OneDayInterval";
inline constexpr std::string_view postUpgradeOutreachDelay = "PostUpgradeOutreachDelay";
inline constexpr std::string_view serverVersionURL = "ServerVersionURL";
inline constexpr std::string_view warrantyURL = "WarrantyURL";

inline constexpr std::string_view defaultDeviceActivationDate = "DefaultDeviceActivationDate";
// Set by testers: a dictionary from the serial number in a request to that of the test watch that stands for it.
inline constexpr std::string_view pairedWatchesSerialNumbers = "PairedWatchesSerialNumbers";

}  // namespace vrx::platform::settings
