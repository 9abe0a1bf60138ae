// Whether the support app is installed, was purchased or is offered in the Marketplace, with the data that a client
// shows of it. It has no state; any thread may ask.
//
// Answers are dictionaries: "AppAvailabilityType" tells the class of the answer, the other keys are texts and
// addresses.
#pragma once

#include <string>

#include "vrx/platform/task.h"
#include "vrx/platform/value.h"
#include "vrx/protocols/agent_collaborators.h"

namespace vrx {

class VRXOrvaneSupportManager final : public VRXSupportManaging {
public:
    using Reply = platform::OnceCallback<platform::Value>;

    // Whether the Marketplace offers the application. Replies null when the lookup failed, on any thread.
    void checkIsAvailableInStore(std::string bundleIdentifier, Reply reply) override;
    // Whether the application is installed, else purchased, else offered. Blocks the calling thread while it asks for
    // the purchases.
    void appSupportAvailability(std::string bundleIdentifier, Reply reply) override;

    // Whether the user's account has bought the application, as far as that is known within 5 seconds, for which the
    // calling thread waits.
    platform::Dictionary checkAppIsPurchased(const std::string& bundleIdentifier) const;
};

}  // namespace vrx
