// What the machine gives activities at this moment, as an agent with the profile would see it. One thread.
#pragma once

#include <string>

#include "vrx/host/profile/device_profile.h"

namespace vrx::apps {

struct MachineSituation {
    bool isNetworkAvailable = false;
    std::string networkJudge = {};  // who says so, for people: "NetworkManager (portal)"
    bool shouldDefer = false;       // activities that wait for better times; metered networks are not counted
    std::string deferralJudge = {};
};

// Asks the machine's services, for a second at most; not where the profile keeps the agent from it.
MachineSituation examineMachine(const host::DeviceProfile& profile);

}  // namespace vrx::apps
