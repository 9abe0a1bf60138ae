#include "vrxhost/follow_up_explanation.h"

#include <algorithm>

namespace vrx::apps {

using platform::Date;

namespace {

using enum FollowUpState;
using Circumstances = FollowUpCircumstances;
using Explanation = FollowUpExplanation;

constexpr const char* askForOutreach = "vrxctl outreach has the agent look for offers now.";

std::string recordProblem(const Circumstances& device) {
    if (!device.hasRecord) return "no coverage record is cached";
    if (!device.recordFlaw) return "";
    switch (*device.recordFlaw) {
        case CachedRecordFlaw::OutdatedVersion: return "the cached coverage record is in an outdated format";
        case CachedRecordFlaw::OtherLocale: return "the cached coverage record is in another language";
        case CachedRecordFlaw::SignedOut: return "nobody is signed in, and the cached coverage record does not count";
    }
    return "";
}

// The activity that considers posting next.
NextStep nextConsideration(const Circumstances& device) {
    if (device.postRun) return NextStep::Post;
    return device.outreach ? NextStep::Outreach : NextStep::None;
}

std::string endOfOffer(const Circumstances& device) {
    return device.eligibleUntil ? "the offer has ended" : "the record names no end of the offer";
}

Explanation explainShown(const Circumstances& device) {
    const auto leaves = [](const char* rule, const std::string& reason) {
        return Explanation{Shown, rule, "it is shown, and the next refresh takes it away: " + reason, std::nullopt,
                           NextStep::Refresh};
    };
    if (!device.isTracked) return leaves("unknown-device", "the agent knows no such device any more");
    switch (device.refresh) {
        case RefreshReason::NoRecord: return leaves("no-record", recordProblem(device));
        case RefreshReason::NoOffer: return leaves("no-offer", "the record asks for no offer");
        case RefreshReason::NoLongerEligible: return leaves("no-longer-eligible", endOfOffer(device));
        case RefreshReason::Pending:
        case RefreshReason::RepostAllowed:
        case RefreshReason::NotPending: break;
    }
    return {Shown, "eligible", "it was posted, and the offer still holds", device.eligibleUntil, NextStep::Refresh};
}

Explanation explainWithoutRecord(const Circumstances& device) {
    const NextStep next = nextConsideration(device);
    const std::string problem = recordProblem(device);
    if (next == NextStep::None)
        return {NotOffered,   "no-record", problem + ", and nothing is scheduled that downloads one",
                std::nullopt, next,        askForOutreach};
    return {Waiting, "no-record", problem + "; the next run downloads one",
            next == NextStep::Post ? device.postRun : device.outreach, next};
}

// Explains the date before which it is not posted.
Explanation explainPostDate(const Circumstances& device) {
    const DueDate& date = *device.post.dueDate;
    Explanation explanation{Waiting, "", ""};
    if (date.isInitial) {
        explanation.rule = "outreach-delay";
        explanation.text = "the outreach delay after the device's activation is not over";
    } else if (device.displayDate) {
        explanation.rule = "display-date";
        explanation.text = "the day on which the record has it shown lies ahead";
    } else {
        explanation.rule = "days-before-end";
        explanation.text = "the record has it shown only shortly before the offer's end";
    }
    return explanation;
}

// For an offer that nobody has dismissed. The order of the questions is that of the agent: the offer's end, what is
// scheduled, the carrier, the date of the run.
Explanation explainUnposted(const Circumstances& device) {
    const Date end = *device.eligibleUntil;
    const Date day = device.post.dueDate->date;
    if (day >= end) return {NotOffered, "ends-first", "the offer ends before the day on which it would be shown"};
    const NextStep next = nextConsideration(device);
    const std::string posted = device.wasPosted ? ": it was posted before" : "";
    if (next == NextStep::None)
        return {Waiting,
                "nothing-scheduled",
                (device.post.reason == PostReason::Due ? "it is due" : "its day lies ahead") +
                    (", but nothing is scheduled that would have it posted" + posted),
                std::nullopt,
                next,
                askForOutreach};
    if (next == NextStep::Outreach && device.isCarrierOut && !device.posting)
        return {NotOffered, "carrier", "the record leaves out a carrier of this device", std::nullopt, next};

    const Date run = std::max(device.now, next == NextStep::Post ? *device.postRun : *device.outreach);
    if (run >= end) return {NotOffered, "ends-first", "the offer ends before the next run", std::nullopt, next};
    if (!device.posting)
        return {Waiting,
                "posts-end",
                (next == NextStep::Post ? "the next post" : "the post that the next outreach schedules") +
                    (" comes too early for it, and by the agent's rule for dates none follows" + posted),
                std::nullopt,
                next,
                askForOutreach};
    if (run < day) {
        Explanation explanation = explainPostDate(device);
        explanation.until = device.posting;
        explanation.next = next;
        return explanation;
    }
    if (next == NextStep::Post) return {Waiting, "next-post", "it is due, and the next post shows it", run, next};
    return {Waiting, "next-outreach", "it is due, and the next outreach has it posted", device.posting, next};
}

}  // namespace

Explanation explainFollowUp(const Circumstances& device) {
    if (device.isPending) return explainShown(device);
    if (!device.isTracked)
        return {NotOffered,   "unknown-device", "the agent knows no such device",
                std::nullopt, NextStep::None,   "vrxctl device and vrxctl paired list those it knows."};
    switch (device.post.reason) {
        case PostReason::NoRecord: return explainWithoutRecord(device);
        case PostReason::NoOffer: return {NotOffered, "no-offer", "the record asks for no offer"};
        case PostReason::NoLongerEligible: return {NotOffered, "no-longer-eligible", endOfOffer(device)};
        case PostReason::Dismissed: return {Dismissed, "dismissed", "it was dismissed, which holds for good"};
        case PostReason::Due:
        case PostReason::DueLater: break;
    }
    return explainUnposted(device);
}

}  // namespace vrx::apps
