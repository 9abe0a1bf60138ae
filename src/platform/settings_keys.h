// The keys of the agent's settings that more than one part of it reads. Each has a registered value, which holds while
// none is stored; durations are in seconds. A key that a single part reads stands there.
#pragma once

#include <string_view>

namespace vrx::platform::settings {

inline constexpr std::string_view cachedWarrantyValidityDuration = "CachedWarrantyValidityDuration";
inline constexpr std::string_view highServerVersion = "HighServerVersion";
inline constexpr std::string_view lowServerVersion = "LowServerVersion";
inline constexpr std::string_view oneDayInterval = "OneDayInterval";
inline constexpr std::string_view postUpgradeOutreachDelay = "PostUpgradeOutreachDelay";
inline constexpr std::string_view serverVersionURL = "ServerVersionURL";
inline constexpr std::string_view warrantyURL = "WarrantyURL";

}  // namespace vrx::platform::settings
