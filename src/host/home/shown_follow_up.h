// How the settings app shows a pending item at one moment: it renders the days that are left itself, from texts in the
// item's user info. Any thread may call.
#pragma once

#include <cstdint>
#include <optional>
#include <string>

#include "vrx/platform/date.h"
#include "vrx/platform/defaults_store.h"
#include "vrx/platform/follow_up_controller.h"
#include "vrx/platform/locale.h"

namespace vrx::host {

struct ShownFollowUp {
    bool hasBadge = false;
    bool isExpired = false;
    std::optional<std::int64_t> daysLeft{};          // absent without an expiration date
    std::optional<std::string> daysText{};           // their text, if the user info has one
    std::optional<platform::Date> nextTextChange{};  // when fewer days will be left, or it expires

    // The text below the title: that of the days, else the item's own.
    std::optional<std::string> text(const platform::FollowUpItem& item) const {
        return daysText ? daysText : item.informativeFooterText;
    }
};

// The day is the setting's: testers shorten it. Numbers are written in the locale's digits.
ShownFollowUp shownFollowUp(const platform::FollowUpItem& item, platform::Date now, platform::Duration day,
                            const platform::Locale& locale);

// The length of a day, by the settings; 86,400 seconds when that is none.
platform::Duration dayInterval(const platform::DefaultsStore& defaults);

}  // namespace vrx::host
