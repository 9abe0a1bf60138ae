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

// The client identifier under which the agent uses the follow-up service.
std::string followUpClientIdentifier();
// The identifier of a device's item. Without a serial number it is the client identifier alone, under which earlier
// versions of the agent posted their only item.
std::string followUpUniqueIdentifier(const std::optional<std::string>& serialNumber);
// The serial number of the device that an item belongs to; null when the user info holds none or not a string.
const std::string* serialNumberOfItem(const platform::FollowUpItem& item);

// An item that says which device it is for, where and how it is shown, and nothing else yet.
platform::FollowUpItem newFollowUpItem(const VRXDevice& device, std::string settingsAppBundleIdentifier);

struct FilledFollowUpItem {
    platform::FollowUpItem item;
    bool showsRowBadge = false;
};

// Fills the item with texts, dates, user info and action from the record, which the info must have. The identifiers
// stay, and the display style keeps the bits it has. A value that is not a text in the record is left empty or, in the
// user info, left out.
FilledFollowUpItem filledFollowUpItem(platform::FollowUpItem item, const VRXDeviceInfo& info,
                                      const platform::Clock& clock);

}  // namespace vrx
