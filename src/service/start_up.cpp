#include "service/start_up.h"

#include "platform/log.h"
#include "platform/platform.h"
#include "platform/vendor.h"
#include "service/register_defaults.h"
#include "support/orvane_support_manager.h"

namespace vrx {

using platform::Platform;

namespace {

// What agents are given of the parts that need agents in turn.
AgentCollaborators collaborators() {
    AgentCollaborators collaborators;
    collaborators.makeSupportManager = [] { return std::make_shared<VRXOrvaneSupportManager>(); };
    return collaborators;
}

}  // namespace

StartUp::StartUp() : delegate_(collaborators()) {
    log(platform::Level::Default, "launched");
    vrx_registerDefaults(Platform::current().defaultsStore());
    listener_ = Platform::current().serviceListenerFactory().makeListener(
        platform::vendorIdentifier(platform::serviceNameRemainder));
    listener_->setDelegate(&delegate_);
    listener_->resume();
}

}  // namespace vrx
