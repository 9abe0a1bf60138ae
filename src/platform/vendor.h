// The reverse-DNS prefix that begins every identifier of the agent.
#pragma once

#include <string>
#include <string_view>

namespace vrx::platform {

inline constexpr std::string_view vendorPrefix = "com.orvane";

// The identifier made of the vendor prefix and the remainder, which begins with a dot.
inline std::string vendorIdentifier(std::string_view remainder) {
    return std::string(vendorPrefix).append(remainder);
}

inline constexpr std::string_view serviceNameRemainder = ".vrxagent";          // also the agent's bundle identifier
inline constexpr std::string_view entitlementRemainder = ".private.vrxagent";  // must be the boolean true
inline constexpr std::string_view settingsAppRemainder = ".Preferences";       // the caller when no other is known

}  // namespace vrx::platform
