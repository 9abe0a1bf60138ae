#include "vrxhost/home_state.h"

#include "vrx/followup/follow_up_content.h"
#include "vrx/host/activities/machine_conditions.h"
#include "vrx/host/home/defaults_store.h"
#include "vrx/host/home/follow_up_controller.h"
#include "vrx/host/home/home_lock.h"
#include "vrx/host/home/stored_facts.h"
#include "vrx/host/profile/profile_notifier.h"

namespace vrx::apps {

platform::Result<HomeState> readHomeState(AgentView& view) {
    HomeState state;
    const platform::MaybeError error = view.readAtOnce([&](host::Connection& connection) {
        host::ActivityRegistry registry(connection);
        state.settings = host::storedSettings(connection);
        state.items = host::FollowUpControllers::pending(connection, followUpClientIdentifier());
        state.activities = {registry.scheduled(), registry.runs(), registry.history()};
        state.language = view.language(host::storedFact(connection, host::stored_facts::language));
        state.agentVersion = host::storedFact(connection, host::stored_facts::agentVersion);
        state.boot = host::storedFact(connection, host::stored_facts::boot);
        for (const std::string_view name :
             host::owedNotifications(connection, host::pairedWatches(view.profile()), state.language))
            state.owedNotifications.emplace_back(name);
        state.now = host::presentMoment();
    });
    if (error) return *error;
    const platform::Platform& platform = platform::Platform::current();
    state.account = platform.accountStore().primaryCloudAccount();
    state.carriers = platform.telephonyNetworkInfo().serviceSubscriberCellularProviders();
    state.timeZoneOffset = platform.clock().timeZoneOffset();
    state.machine = examineMachine(view.profile());
    state.isAgentRunning = host::HomeLock::isInUse(view.home());
    return state;
}

}  // namespace vrx::apps
