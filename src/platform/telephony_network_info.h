// The device's cellular subscriptions. Any thread may ask; each call reads the present state.
#pragma once

#include <map>
#include <optional>
#include <string>

namespace vrx::platform {

struct Carrier {
    std::optional<std::string> mobileCountryCode{};
    std::optional<std::string> mobileNetworkCode{};

    bool operator==(const Carrier&) const = default;
    std::string description() const {
        return "carrier " + mobileCountryCode.value_or("(null)") + " " + mobileNetworkCode.value_or("(null)");
    }
};

class TelephonyNetworkInfo {
public:
    virtual ~TelephonyNetworkInfo() = default;
    // The cellular provider of every subscription, by service identifier.
    virtual std::map<std::string, Carrier> serviceSubscriberCellularProviders() const = 0;
    virtual std::string description() const = 0;
};

}  // namespace vrx::platform
