// A whole host in memory, under virtual time: what tests and simulations run the agent on. One thread drives it, the
// test's body; it is the current platform for as long as it lives.
//
//     sim::Host host;
//     host.http.answer(url, sim::HttpAnswer::ok("{}").after(2s));
//     agent.download(…);
//     host.runFor(2s);
//     EXPECT_TRUE(host.log.contains("…"));
//
// Declare it before whatever uses it. At its end no task may wait any longer; what has not begun is discarded.
#pragma once

#include "codec/codec.h"
#include "platform/platform.h"
#include "sim/account_store.h"
#include "sim/bundle_lookup.h"
#include "sim/clock.h"
#include "sim/defaults_store.h"
#include "sim/device.h"
#include "sim/failures.h"
#include "sim/files.h"
#include "sim/http.h"
#include "sim/locale.h"
#include "sim/queues.h"
#include "sim/service_listener.h"
#include "sim/system_log.h"
#include "sim/uuid.h"

namespace vrx::sim {

class Host {
public:
    Host();
    ~Host() { queues.close(); }
    Host(const Host&) = delete;
    Host& operator=(const Host&) = delete;

    void run() { queues.run(); }
    void runFor(platform::Duration duration) { queues.runFor(duration); }
    void runUntil(platform::Date date) { queues.runUntil(date); }

    Failures failures;
    Clock clock;
    SystemLog log;
    DefaultsStore defaults{failures};
    Files files;
    DeviceProperties device;
    FeatureFlags flags;
    PairedDeviceRegistry watches;
    Locale locale;
    BundleLookup bundles;
    Queues queues{clock, failures};
    AccountStore accounts{queues};
    AccountSession accountSession;
    HttpSessions http{clock, queues, files};
    ServiceListenerFactory listener{queues, failures};
    codec::Json json;
    codec::PropertyList propertyList;
    codec::Digest digest;
    UuidSource uuids;
    platform::Platform platform;

private:
    platform::ScopedPlatform scope_;
};

}  // namespace vrx::sim
