// What the machine's services tell of who the device is.
#pragma once

#include <map>
#include <optional>
#include <string>
#include <vector>

#include "vrx/platform/date.h"
#include "vrx/platform/telephony_network_info.h"

namespace vrx::host {

// A watch that is paired with this machine.
struct KnownWatch {
    std::string address;
    // The address of the adapter it is paired with. Only while that is there can the watch be unpaired.
    std::string adapter = {};
    std::string name = {};
    // These are read from the watch itself, once.
    std::optional<std::string> model = {};
    std::optional<std::string> serialNumber = {};
    // When it was seen paired first.
    platform::Date pairingDate = {};

    bool operator==(const KnownWatch&) const = default;
};

struct ToldFacts {
    std::optional<std::string> serialNumber{};
    std::optional<std::string> language{};                // "de_DE"
    std::map<std::string, platform::Carrier> carriers{};  // by cellular service
    std::vector<KnownWatch> watches{};

    bool operator==(const ToldFacts&) const = default;
};

}  // namespace vrx::host
