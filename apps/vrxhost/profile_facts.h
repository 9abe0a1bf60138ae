// What a key of the device profile comes to: the profile's value, else the machine's or the agent's, and where it is
// from.
#pragma once

#include <string>
#include <vector>

#include "vrx/host/profile/device_profile.h"
#include "vrxhost/machine_situation.h"

namespace vrx::apps {

struct ProfileFact {
    platform::Value value;  // null for none
    std::string source;     // "PATH:LINE", or for people: "firmware", "the agent's default"
};

// Every key that there is. Without a file that has feature flags, the only one that the agent asks for is among them.
std::vector<host::ProfileKey> profileKeys(const host::DeviceProfile& profile);

ProfileFact factInForce(const host::ProfileKey& key, const host::DeviceProfile& profile,
                        const MachineSituation& machine);
ProfileFact factInForce(const std::string& key, const host::DeviceProfile& profile, const MachineSituation& machine);

}  // namespace vrx::apps
