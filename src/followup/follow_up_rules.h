// What becomes of a device's follow-up, and why: the two decisions of the follow-up manager, for the manager and for
// the program that explains them. Pure functions of the device with its record, of what is known of its follow-up, and
// of the clock, which every comparison with now reads anew. An absent date counts as now.
#pragma once

#include <cstdint>
#include <optional>

#include "vrx/platform/date.h"

namespace vrx::platform {
class Clock;
}

namespace vrx {

class VRXDeviceInfo;
class VRXWarranty;

// Why a follow-up is posted or not: the first of these that holds, in this order. Only Due posts.
enum class PostReason : std::uint8_t { NoRecord, NoOffer, NoLongerEligible, Dismissed, Due, DueLater };

struct PostCircumstances {
    bool isDismissed = false;
    bool isRepostAllowed = false;         // a dismissal then does not count
    platform::Duration outreachDelay{0};  // counted from the device's activation; nothing is posted before its end
};

// From when on a device's follow-up may be posted: dueDateInRecord(), but never before the outreach delay is over. It
// says when one follow-up is due; nextPostDate() in scheduling/post_date.h says when the post activity runs next. That
// rule differs: it does not count back from the offer's end, takes a missing activation date for an outreach delay that
// ends now, and leaves out devices whose follow-up was posted before.
struct DueDate {
    platform::Date date;
    bool isInitial = false;  // the outreach delay ends later than the date in the record
};

struct PostDecision {
    PostReason reason;
    std::optional<DueDate> dueDate{};  // for Due and DueLater
};

// The due date that a record itself gives: the day it names, else its duration before the end of the offer. Null when
// the record names no day and its offer has no end; no follow-up is ever posted for such a record.
std::optional<platform::Date> dueDateInRecord(const VRXWarranty& record);

PostDecision decidePost(const VRXDeviceInfo& info, const PostCircumstances& circumstances,
                        const platform::Clock& clock);

// Why a refresh does what it does: the first of these that holds, in this order. actionFor() says what follows.
enum class RefreshReason : std::uint8_t { NoRecord, NoOffer, NoLongerEligible, Pending, RepostAllowed, NotPending };
enum class RefreshAction : std::uint8_t { Remove, Update, Repost, LeaveAlone };

struct RefreshCircumstances {
    bool isPending = false;
    bool isForcePostAllowed = false;
};

RefreshReason decideRefresh(const VRXDeviceInfo& info, const RefreshCircumstances& circumstances,
                            const platform::Clock& clock);
RefreshAction actionFor(RefreshReason reason);

}  // namespace vrx
