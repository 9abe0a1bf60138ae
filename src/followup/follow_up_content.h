// What a follow-up item holds: functions of the item so far, the device with its record, and the clock.
#pragma once

#include <optional>
#include <string>
#include <string_view>

#include "vrx/platform/follow_up_controller.h"

namespace vrx::platform {
class Clock;
}

namespace vrx {

class VRXDevice;
class VRXDeviceInfo;

// The client on whose behalf the agent uses the follow-up service.
std::string followUpClientIdentifier();
// Of a device's item. Without a serial number the client identifier alone, under which earlier versions of the agent
// posted the only item they had.
std::string followUpUniqueIdentifier(const std::optional<std::string>& serialNumber);
// The serial number of the device that an item belongs to; null when its user info names none, or no string.
const std::string* serialNumberOfItem(const platform::FollowUpItem& item);

// An item that says for which device it is, where it is shown and how, and nothing else yet.
platform::FollowUpItem newFollowUpItem(const VRXDevice& device, std::string settingsAppBundleIdentifier);

struct FilledFollowUpItem {
    platform::FollowUpItem item;
    bool showsRowBadge = false;
};

// The item with its texts, dates, user info and action from the record, which the info must have. Its identifiers stay,
// and its display style keeps the bits it has. What the record does not have as a text is left empty or, in the user
// info, left out.
FilledFollowUpItem filledFollowUpItem(platform::FollowUpItem item, const VRXDeviceInfo& info,
                                      const platform::Clock& clock);

}  // namespace vrx
