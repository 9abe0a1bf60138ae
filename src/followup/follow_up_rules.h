// What becomes of a device's follow-up, and why: the two decisions of the follow-up manager, for it and for whoever has
// to explain them. Pure functions of the device with its record, of what is known of its follow-up and of the clock,
// which every comparison with the present reads anew. A date that is absent counts as the present.
#pragma once

#include <cstdint>
#include <optional>

#include "vrx/platform/date.h"

namespace vrx::platform {
class Clock;
}

namespace vrx {

class VRXDeviceInfo;

// Whether a follow-up is posted: the first of these that holds, in this order, and only Due is.
enum class PostReason : std::uint8_t { NoRecord, NoOffer, NoLongerEligible, Dismissed, Due, DueLater };

struct PostCircumstances {
    bool isDismissed = false;
    bool isRepostAllowed = false;         // then a dismissal does not count
    platform::Duration outreachDelay{0};  // after the device's activation, before which nothing is posted
};

struct PostDate {
    platform::Date date;
    bool isInitial = false;  // the device's first days end later than the record would have it shown
};

struct PostDecision {
    PostReason reason;
    std::optional<PostDate> postDate{};  // of Due and DueLater
};

PostDecision decidePost(const VRXDeviceInfo& info, const PostCircumstances& circumstances,
                        const platform::Clock& clock);

// What a refresh does: the first of these that holds, in this order, and what it leads to.
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
