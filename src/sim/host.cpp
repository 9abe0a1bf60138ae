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
                .httpSessions = &http,
                .json = &json,
                .locale = &locale,
                .pairedDeviceRegistry = &watches,
                .propertyList = &propertyList,
                .queues = &queues,
                .serviceListenerFactory = &listener,
                .systemLog = &log,
                .uuidSource = &uuids}),
      scope_(platform) {}

}  // namespace vrx::sim
