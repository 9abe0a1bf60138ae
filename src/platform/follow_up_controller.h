// The settings app's follow-up service: items that it shows to the user for a client, until the client clears them.
// Any thread may ask; each request returns when the service has answered.
#pragma once

#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "vrx/platform/date.h"
#include "vrx/platform/error.h"
#include "vrx/platform/value.h"

namespace vrx::platform {

struct FollowUpAction {
    std::optional<std::string> label{};
    std::optional<std::string> url{};  // without one, the target decides what opens

    bool operator==(const FollowUpAction&) const = default;
};

// Bits of an item's display style. Filling an item anew clears no bit, so an item may hold both row bits; then it shows
// the badge.
namespace follow_up_style {
inline constexpr std::uint64_t withRowBadge = 1;
inline constexpr std::uint64_t notification = 2;  // every item that the agent posts has it
inline constexpr std::uint64_t withoutRowBadge = 16;
}  // namespace follow_up_style

// User-info keys from which the settings app itself renders the days until the item's expiration date. The constants
// have the names that the settings app gives them.
inline constexpr std::string_view DaysLeftRoundsUpKey = "DaysLeftRoundsUp";  // boolean: a day that has begun counts
inline constexpr std::string_view OneDayLeftTextKey = "OneDayLeftText";      // the text while at most one day is left
inline constexpr std::string_view DaysLeftFormatKey = "DaysLeftFormat";  // the text otherwise, with "%@" for the number

struct FollowUpItem {
    std::string uniqueIdentifier;
    std::optional<std::string> groupIdentifier{};
    std::optional<std::string> targetBundleIdentifier{};
    std::optional<std::string> extensionIdentifier{};
    std::uint64_t displayStyle = 0;
    std::optional<std::string> title{};
    std::optional<std::string> informativeFooterText{};
    std::optional<Date> expirationDate{};
    Dictionary userInfo{};
    std::vector<FollowUpAction> actions{};

    bool operator==(const FollowUpItem&) const = default;
};

// Requests on behalf of one client identifier.
class FollowUpController {
public:
    virtual ~FollowUpController() = default;
    // Posts the item in the place of a pending one with the same unique identifier; an error leaves that one as it was.
    virtual MaybeError postFollowUpItem(const FollowUpItem& item) = 0;
    // Clears all of them or, with an error, none. An identifier under which no item is pending is not an error.
    virtual MaybeError clearPendingFollowUpItems(const std::vector<std::string>& uniqueIdentifiers) = 0;
    // The items that were posted and not yet cleared, expired ones included, in the order of first posting.
    virtual Result<std::vector<FollowUpItem>> pendingFollowUpItems() = 0;
};

class FollowUpControllers {
public:
    virtual ~FollowUpControllers() = default;
    virtual std::unique_ptr<FollowUpController> makeController(std::string clientIdentifier) = 0;
    // The bundle identifier of the settings app, the target of items that it shows at its root.
    virtual std::string settingsAppBundleIdentifier() const = 0;
};

}  // namespace vrx::platform
