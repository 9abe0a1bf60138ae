#include "service/start_up.h"

#include "followup/follow_up.h"
#include "platform/log.h"
#include "platform/platform.h"
#include "platform/vendor.h"
#include "service/agent.h"
#include "service/register_defaults.h"

namespace vrx {

using platform::Platform;

namespace {

// What agents are given of the parts that need agents in turn. Outreach and the support app are not there yet.
AgentCollaborators collaborators() {
    AgentCollaborators collaborators;
    collaborators.makeFollowUp = [] { return std::make_shared<VRXFollowUp>(); };
    return collaborators;
}

}  // namespace

StartUp::StartUp() : delegate_(collaborators()) {
    log(platform::Level::Default, "launched");
    vrx_registerDefaults(Platform::current().defaultsStore());
    agent_ = VRXAgent::initWithCallingProcessBundleID(platform::vendorIdentifier(platform::settingsAppRemainder),
                                                      collaborators());
    agent_->performMigrationIfNeeded();
    listener_ = Platform::current().serviceListenerFactory().makeListener(
        platform::vendorIdentifier(platform::serviceNameRemainder));
    listener_->setDelegate(&delegate_);
    listener_->resume();
}

}  // namespace vrx
