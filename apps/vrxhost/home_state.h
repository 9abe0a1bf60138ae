// All that decides what an agent of a home does next, as it stood at one moment.
#pragma once

#include <chrono>
#include <map>
#include <optional>
#include <string>
#include <vector>

#include "vrx/host/activities/activity_registry.h"
#include "vrx/platform/activity_timing.h"
#include "vrx/platform/follow_up_controller.h"
#include "vrxhost/agent_view.h"
#include "vrxhost/machine_situation.h"

namespace vrx::apps {

struct HomeState {
    platform::Moment now;
    platform::Dictionary settings;  // the stored ones
    std::vector<platform::FollowUpItem> items;
    host::ActivityList activities;
    std::string language;
    std::optional<platform::CloudAccount> account;
    std::map<std::string, platform::Carrier> carriers;
    std::chrono::seconds timeZoneOffset{};
    MachineSituation machine;
    bool isAgentRunning = false;
    // What the next start of an agent finds: for what the system has fired its own activities, and what has changed.
    std::optional<std::string> agentVersion, boot;
    std::vector<std::string> owedNotifications;  // remainders of their names
};

// Reads the database in one transaction; an agent may write to it meanwhile.
platform::Result<HomeState> readHomeState(AgentView& view);

}  // namespace vrx::apps
