// The provider that asks the platform's follow-up service, through a new controller for each request. It has no state,
// changes no answer and logs nothing.
#pragma once

#include "vrx/followup/follow_up_provider.h"

namespace vrx {

// Spelled with three l's on purpose.
class VRXDefaultFolllowUpProvider final : public VRXFollowUpProvider {
public:
    bool postFollowUpItem(const platform::FollowUpItem& item, platform::MaybeError* error) override;
    bool clearPendingFollowUpItemsWithUniqueIdentifiers(const std::vector<std::string>& uniqueIdentifiers,
                                                        platform::MaybeError* error) override;
    // Empty when the service could not list them.
    std::vector<platform::FollowUpItem> pendingFollowUpItems(platform::MaybeError* error) override;
};

}  // namespace vrx
