// When follow-ups are to be posted next: the rule of the follow-up post activity, of the monitor of paired devices and
// of whoever explains the two. A pure function of the devices with their records, the settings and the clock.
#pragma once

#include <optional>
#include <set>
#include <string>

#include "vrx/platform/date.h"
#include "vrx/protocols/forward.h"

namespace vrx {

struct PostDateSettings {
    std::set<std::string> postedSerialNumberHashes;  // of the devices whose follow-up has been posted before
    platform::Duration outreachDelay{};              // after a device's activation

    // As they are stored now.
    static PostDateSettings read();
};

// Nothing when no device has a post to come. A date in the past when an offer has ended that was never posted.
std::optional<platform::Date> nextPostDate(const DeviceInfoList& deviceInfos, const PostDateSettings& settings,
                                           platform::Date now);

}  // namespace vrx
