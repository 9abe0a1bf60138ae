// What is shown of follow-ups over time, and what the agent does for it, as a play on the simulated host has shown it.
// For people: timeline_text.h and page.h show it, document.h gives it to programs.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "vrx/platform/date.h"

namespace vrx::timeline {

// A time in which an item looks the same.
struct Shown {
    platform::Date from{};
    std::optional<platform::Date> until{};  // null when it is still shown at the end
    std::string title{};
    std::string text{};  // below the title, with the days that are left
    std::string action{};
    bool hasBadge = false;
    bool isExpired = false;
    std::optional<std::int64_t> daysLeft{};

    bool looksLike(const Shown& other) const {
        return title == other.title && text == other.text && action == other.action && hasBadge == other.hasBadge &&
               isExpired == other.isExpired;
    }
};

// An offer of a coverage record, from the day on which its follow-up may be shown.
struct Offer {
    std::optional<platform::Date> from{};
    platform::Date until{};
    bool operator==(const Offer&) const = default;
};

struct DeviceLane {
    std::string serialNumber;  // empty for an item that names no device
    std::optional<std::string> name{};
    std::string kind = "Other";  // or Default, Watch
    bool isDismissed = false;    // its follow-up was dismissed and stays away
    bool hasRecord = false;      // one that counts is cached
    std::optional<platform::Date> activation{};
    std::optional<platform::Date> coverageEnd{};
    std::vector<Offer> offers{};  // in the order in which records made them
    std::vector<Shown> shown{};   // in the order of time
};

struct PastRun {
    platform::Date began{};
    std::optional<platform::Date> ended{};
    std::string outcome{};  // finished, deferred, running or interrupted
};

struct ActivityLane {
    std::string identifier;
    std::optional<PastRun> lastRun{};  // before the play
    std::vector<platform::Date> runs{};
};

struct Chronicle {
    platform::Date from{};
    platform::Date until{};
    std::optional<platform::Date> now{};  // null for a life that is not played from the present on
    bool isComplete = false;              // nothing more comes after the end
    std::vector<std::string> assumptions{};
    std::vector<DeviceLane> devices{};
    std::vector<ActivityLane> activities{};
};

}  // namespace vrx::timeline
