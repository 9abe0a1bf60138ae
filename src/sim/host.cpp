#include "vrx/sim/host.h"

namespace vrx::sim {

Host::Host()
    : platform({.accountSession = &accountSession,
                .accountStore = &accounts,
                .backgroundActivities = &activities,
                .bundleLookup = &bundles,
                .clock = &clock,
                .defaultsStore = &defaults,
                .deviceProperties = &device,
                .digest = &digest,
                .featureFlags = &flags,
                .files = &files,
                .followUpControllers = &followUps,
                .httpSessions = &http,
                .installedApps = &installedApps,
                .json = &json,
                .locale = &locale,
                .localizedStrings = &localizedStrings,
                .notificationCenter = &notifications,
                .pairedDeviceRegistry = &watches,
                .processLifecycle = &process,
                .propertyList = &propertyList,
                .purchaseHistory = &purchaseHistory,
                .queues = &queues,
                .serviceListenerFactory = &listener,
                .store = &store,
                .systemLog = &log,
                .telephonyNetworkInfo = &telephony,
                .uuidSource = &uuids}),
      scope_(platform) {}

Host::~Host() {
    queues.close();
    process.kill();
}

}  // namespace vrx::sim
