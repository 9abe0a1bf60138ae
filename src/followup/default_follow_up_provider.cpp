#include "vrx/followup/default_follow_up_provider.h"

#include <memory>
#include <utility>

#include "vrx/followup/follow_up_content.h"
#include "vrx/platform/platform.h"

namespace vrx {

using platform::FollowUpController;
using platform::FollowUpItem;
using platform::MaybeError;

namespace {

std::unique_ptr<FollowUpController> makeController() {
    return platform::Platform::current().followUpControllers().makeController(followUpClientIdentifier());
}

bool succeeded(MaybeError result, MaybeError* error) {
    const bool success = !result;
    if (!success && error) *error = std::move(result);
    return success;
}

}  // namespace

bool VRXDefaultFolllowUpProvider::postFollowUpItem(const FollowUpItem& item, MaybeError* error) {
    return succeeded(makeController()->postFollowUpItem(item), error);
}

bool VRXDefaultFolllowUpProvider::clearPendingFollowUpItemsWithUniqueIdentifiers(
    const std::vector<std::string>& uniqueIdentifiers, MaybeError* error) {
    return succeeded(makeController()->clearPendingFollowUpItems(uniqueIdentifiers), error);
}

std::vector<FollowUpItem> VRXDefaultFolllowUpProvider::pendingFollowUpItems(MaybeError* error) {
    platform::Result<std::vector<FollowUpItem>> items = makeController()->pendingFollowUpItems();
    if (items) return std::move(items).value();
    if (error) *error = items.error();
    return {};
}

}  // namespace vrx
