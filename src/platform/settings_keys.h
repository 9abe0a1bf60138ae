// The keys of the agent's settings that more than one part of it uses; a key that a single part uses stands there.
#pragma once

#include <string_view>

namespace vrx::platform::settings {

// These have a registered value, which holds while none is stored. Durations are in seconds.
inline constexpr std::string_view cachedWarrantyValidityDuration = "CachedWarrantyValidityDuration";
inline constexpr std::string_view highServerVersion = "HighServerVersion";
inline constexpr std::string_view lowServerVersion = "LowServerVersion";
inline constexpr std::string_view oneDayInterval = "OneDayInterval";
inline constexpr std::string_view postUpgradeOutreachDelay = "PostUpgradeOutreachDelay";
inline constexpr std::string_view serverVersionURL = "ServerVersionURL";
inline constexpr std::string_view warrantyURL = "WarrantyURL";

inline constexpr std::string_view defaultDeviceActivationDate = "DefaultDeviceActivationDate";
// A tester's watches, and by which serial number each is asked for: a dictionary.
inline constexpr std::string_view pairedWatchesSerialNumbers = "PairedWatchesSerialNumbers";

}  // namespace vrx::platform::settings
