// Explains the state of a device's follow-up: the first of the agent's rules that decides. A pure function of what
// those rules say.
#pragma once

#include <cstdint>
#include <optional>
#include <string>

#include "vrx/followup/follow_up_rules.h"
#include "vrx/platform/date.h"
#include "vrx/service/cached_record.h"

namespace vrx::apps {

struct FollowUpCircumstances {
    platform::Date now;
    bool isTracked = false;     // the agent knows the device
    bool isPending = false;     // its item is shown
    bool wasPosted = false;     // before: no date is set for it again
    bool isCarrierOut = false;  // the record leaves out a carrier of this device
    bool hasRecord = false;
    std::optional<CachedRecordFlaw> recordFlaw{};
    PostDecision post{};
    RefreshReason refresh{};
    std::optional<platform::Date> eligibleUntil{};
    std::optional<platform::Date> displayDate{};  // that the record names
    // When the activities work next.
    std::optional<platform::Date> outreach{};
    std::optional<platform::Date> postRun{};  // null when an outreach comes before it and schedules another
    // By the next post run, the one that the next outreach schedules, or one that follows it by the agent's date rule.
    std::optional<platform::Date> posting{};
};

enum class FollowUpState : std::uint8_t { Shown, Dismissed, Waiting, NotOffered };
enum class NextStep : std::uint8_t { None, Outreach, Post, Refresh };

struct FollowUpExplanation {
    FollowUpState state;
    std::string rule;  // a name for programs
    std::string text;
    std::optional<platform::Date> until{};  // for one that waits or is shown
    NextStep next = NextStep::None;
    std::string advice{};
};

FollowUpExplanation explainFollowUp(const FollowUpCircumstances& circumstances);

}  // namespace vrx::apps
