// When the follow-up post activity is to run next: the rule of that activity, of the monitor of paired devices and of
// the program that explains them. A pure function of the devices with their records, the settings and the clock. What
// the activity then posts, decidePost() in followup/follow_up_rules.h decides by each follow-up's DueDate.
#pragma once

#include <optional>
#include <set>
#include <string>

#include "vrx/platform/date.h"
#include "vrx/protocols/forward.h"

namespace vrx {

struct PostDateSettings {
    std::set<std::string> postedSerialNumberHashes;  // of the devices whose follow-up was posted before
    platform::Duration outreachDelay{};              // after a device's activation

    // The settings as they are stored now.
    static PostDateSettings read();
};

// Null when no device has a post to come. A date in the past when an offer has ended whose follow-up was never posted.
std::optional<platform::Date> nextPostDate(const DeviceInfoList& deviceInfos, const PostDateSettings& settings,
                                           platform::Date now);

}  // namespace vrx
