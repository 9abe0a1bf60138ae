#include "sim/host.h"

namespace vrx::sim {

Host::Host()
    : platform({.accountStore = &accounts,
                .bundleLookup = &bundles,
                .clock = &clock,
                .defaultsStore = &defaults,
                .deviceProperties = &device,
                .featureFlags = &flags,
                .files = &files,
                .httpSessions = &http,
                .locale = &locale,
                .pairedDeviceRegistry = &watches,
                .queues = &queues,
                .serviceListenerFactory = &listener,
                .systemLog = &log}),
      scope_(platform) {}

}  // namespace vrx::sim
