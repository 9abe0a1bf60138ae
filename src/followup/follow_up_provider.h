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
    // Each sets the error, if the caller passes one, exactly when it fails. Whether the service accepted the item, and
    // whether it cleared them all.
    virtual bool postFollowUpItem(const platform::FollowUpItem& item, platform::MaybeError* error) = 0;
    virtual bool clearPendingFollowUpItemsWithUniqueIdentifiers(const std::vector<std::string>& uniqueIdentifiers,
                                                                platform::MaybeError* error) = 0;
    // What is pending, in the order of first posting; with an error, whatever could be had.
    virtual std::vector<platform::FollowUpItem> pendingFollowUpItems(platform::MaybeError* error) = 0;
};

}  // namespace vrx
