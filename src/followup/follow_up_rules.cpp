#include "vrx/followup/follow_up_rules.h"

#include "vrx/devices/records/device_info.h"
#include "vrx/platform/clock.h"

namespace vrx {

using platform::Clock;
using platform::Date;
using platform::Duration;

namespace {

bool isLaterThanNow(const std::optional<Date>& date, const Clock& clock) {
    return date && *date - clock.now() > Duration::zero();
}

// The later of the record's own due date and the end of the outreach delay. A device without an activation date has no
// outreach delay.
DueDate dueDate(Date inRecord, const std::optional<Date>& activationDate, Duration outreachDelay) {
    if (activationDate && *activationDate + outreachDelay > inRecord) return {*activationDate + outreachDelay, true};
    return {inRecord};
}

}  // namespace

std::optional<Date> dueDateInRecord(const VRXWarranty& record) {
    if (auto named = record.qxOfferFollowupDisplayDate()) return named;
    const std::optional<Date> until = record.qxOfferEligibleUntil();
    return until ? std::optional(*until - record.qxOfferDurationBeforeEndDate()) : std::nullopt;
}

PostDecision decidePost(const VRXDeviceInfo& info, const PostCircumstances& circumstances, const Clock& clock) {
    const auto record = info.warranty();
    if (!record) return {PostReason::NoRecord};
    if (!record->qxOfferDisplay()) return {PostReason::NoOffer};
    if (!isLaterThanNow(record->qxOfferEligibleUntil(), clock)) return {PostReason::NoLongerEligible};
    if (circumstances.isDismissed && !circumstances.isRepostAllowed) return {PostReason::Dismissed};
    const auto device = info.device();
    // An offer that has an end has a due date.
    const DueDate date = dueDate(*dueDateInRecord(*record), device ? device->activationDate() : std::nullopt,
                                 circumstances.outreachDelay);
    return {isLaterThanNow(date.date, clock) ? PostReason::DueLater : PostReason::Due, date};
}

RefreshReason decideRefresh(const VRXDeviceInfo& info, const RefreshCircumstances& circumstances, const Clock& clock) {
    const auto record = info.warranty();
    if (!record) return RefreshReason::NoRecord;
    if (!record->qxOfferDisplay()) return RefreshReason::NoOffer;
    if (!isLaterThanNow(record->qxOfferEligibleUntil(), clock)) return RefreshReason::NoLongerEligible;
    if (circumstances.isPending) return RefreshReason::Pending;
    return circumstances.isForcePostAllowed ? RefreshReason::RepostAllowed : RefreshReason::NotPending;
}

RefreshAction actionFor(RefreshReason reason) {
    switch (reason) {
        case RefreshReason::NoRecord:
        case RefreshReason::NoOffer:
        case RefreshReason::NoLongerEligible: return RefreshAction::Remove;
        case RefreshReason::Pending: return RefreshAction::Update;
        case RefreshReason::RepostAllowed: return RefreshAction::Repost;
        case RefreshReason::NotPending: return RefreshAction::LeaveAlone;
    }
    return RefreshAction::LeaveAlone;
}

}  // namespace vrx
