// When shown follow-ups are to be refreshed next: when a day count changes, when one is first shown, when an offer
// ends. This is the rule of the follow-up refresh activity, of the post activity for the first refresh, and of the
// program that explains them. A pure function of the devices with their records, the settings and the clock.
#pragma once

#include <optional>

#include "vrx/platform/date.h"
#include "vrx/protocols/forward.h"

namespace vrx {

struct RefreshDateSettings {
    platform::Duration oneDay{};
    platform::Duration outreachDelay{};  // after a device's activation

    // The settings as they are stored now.
    static RefreshDateSettings read();
};

// Null when no device sets a date, as during a lone device's last day. A date in the past when an offer has ended. The
// initial call begins without a date, any other call with a refresh a day from now.
std::optional<platform::Date> nextRefreshDate(const DeviceInfoList& deviceInfos, bool isInitialCall,
                                              const RefreshDateSettings& settings, platform::Date now);

}  // namespace vrx
