#include "sim/host.h"

namespace vrx::sim {

Host::Host()
    : platform({.accountSession = &accountSession,
                .accountStore = &accounts,
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
                .pairedDeviceRegistry = &watches,
                .propertyList = &propertyList,
                .purchaseHistory = &purchaseHistory,
                .queues = &queues,
                .serviceListenerFactory = &listener,
                .store = &store,
                .systemLog = &log,
                .uuidSource = &uuids}),
      scope_(platform) {}

}  // namespace vrx::sim
