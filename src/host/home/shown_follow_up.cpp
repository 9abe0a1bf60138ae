#include "vrx/host/home/shown_follow_up.h"

#include <algorithm>
#include <cmath>

#include "vrx/platform/number_text.h"
#include "vrx/platform/settings_keys.h"
#include "vrx/platform/text.h"

namespace vrx::host {

using platform::Duration;
using platform::FollowUpItem;
using platform::Value;

namespace {

std::optional<std::string> textIn(const Value& userInfo, std::string_view key) {
    const std::string* text = userInfo[key].asString();
    return text ? std::optional(*text) : std::nullopt;
}

std::optional<std::string> daysText(const Value& userInfo, std::int64_t daysLeft, const platform::Locale& locale) {
    if (daysLeft <= 1) return textIn(userInfo, platform::OneDayLeftTextKey);
    const auto format = textIn(userInfo, platform::DaysLeftFormatKey);
    if (!format) return std::nullopt;
    return platform::filled(*format, {locale.decimalText(static_cast<std::uint64_t>(daysLeft))});
}

}  // namespace

ShownFollowUp shownFollowUp(const FollowUpItem& item, platform::Date now, Duration day,
                            const platform::Locale& locale) {
    ShownFollowUp shown;
    shown.hasBadge = (item.displayStyle & platform::follow_up_style::withRowBadge) != 0;
    if (!item.expirationDate) return shown;
    shown.isExpired = *item.expirationDate <= now;
    const double days = (*item.expirationDate - now) / day;
    if (!std::isfinite(days)) return shown;
    const Value userInfo(item.userInfo);
    const bool roundsUp = userInfo[platform::DaysLeftRoundsUpKey].asBool().value_or(false);
    const double whole = std::max(0.0, roundsUp ? std::ceil(days) : std::floor(days));
    shown.daysLeft = platform::clampedInteger(whole);
    shown.daysText = daysText(userInfo, *shown.daysLeft, locale);
    if (!shown.isExpired)
        shown.nextTextChange = *item.expirationDate - std::max(0.0, roundsUp ? whole - 1 : whole) * day;
    return shown;
}

Duration dayInterval(const platform::DefaultsStore& defaults) {
    const Duration day(defaults.number(platform::settings::oneDayInterval));
    return day.count() > 0 ? day : Duration(std::chrono::days(1));
}

}  // namespace vrx::host
