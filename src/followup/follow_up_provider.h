// What the follow-up manager needs of the platform's follow-up service. Any thread may call it; each call returns when
// the service has answered.
#pragma once

#include <string>
#include <vector>

#include "vrx/platform/error.h"
#include "vrx/platform/follow_up_controller.h"

namespace vrx {

class VRXFollowUpProvider {
public:
    virtual ~VRXFollowUpProvider() = default;
    // Both return whether the service accepted the request, and set the error, if the caller passes one, exactly when
    // it did not.
    virtual bool postFollowUpItem(const platform::FollowUpItem& item, platform::MaybeError* error) = 0;
    virtual bool clearPendingFollowUpItemsWithUniqueIdentifiers(const std::vector<std::string>& uniqueIdentifiers,
                                                                platform::MaybeError* error) = 0;
    // The pending items, in the order of first posting; with an error, those that could be listed.
    virtual std::vector<platform::FollowUpItem> pendingFollowUpItems(platform::MaybeError* error) = 0;
};

}  // namespace vrx
