// A whole host in memory, under virtual time: what tests and simulations run the agent on. One thread drives it, the
// test's body. It is the current platform for as long as it lives.
//
//     sim::Host host;
//     host.http.answer(url, sim::HttpAnswer::ok("{}").after(2s));
//     agent.download(…);
//     host.runFor(2s);
//     EXPECT_TRUE(host.log.contains("…"));
//
// Declare it before everything that uses it. When it ends, no task may still be waiting; tasks that have not begun are
// discarded.
#pragma once

#include <optional>
#include <set>
#include <string>

#include "vrx/codec/codec.h"
#include "vrx/platform/platform.h"
#include "vrx/sim/account_store.h"
#include "vrx/sim/background_activities.h"
#include "vrx/sim/bundle_lookup.h"
#include "vrx/sim/clock.h"
#include "vrx/sim/defaults_store.h"
#include "vrx/sim/device.h"
#include "vrx/sim/failures.h"
#include "vrx/sim/files.h"
#include "vrx/sim/follow_up_controller.h"
#include "vrx/sim/http.h"
#include "vrx/sim/interference.h"
#include "vrx/sim/locale.h"
#include "vrx/sim/notification_center.h"
#include "vrx/sim/process.h"
#include "vrx/sim/queues.h"
#include "vrx/sim/service_listener.h"
#include "vrx/sim/store.h"
#include "vrx/sim/system_log.h"
#include "vrx/sim/uuid.h"

namespace vrx::sim {

class Host {
public:
    Host();
    ~Host();
    Host(const Host&) = delete;
    Host& operator=(const Host&) = delete;

    void run() { queues.run(); }
    void runFor(platform::Duration duration) { queues.runFor(duration); }
    void runUntil(platform::Date date) { queues.runUntil(date); }

    // To be called when the test has changed the language or the watches: tells the process of it by notifications, as
    // profile and services do on a real host. What changes while no process runs, the next is told at its start; the
    // first one is told nothing.
    void tellChanges();

    // Forgets what was recorded of the past, for simulations that last: log, requests, firings, writes.
    void forgetRecords();

    Failures failures;
    Interference interference;
    Clock clock;
    SystemLog log;
    DefaultsStore defaults{failures, interference};
    Files files{interference};
    FollowUpControllers followUps{interference};
    DeviceProperties device;
    FeatureFlags flags;
    PairedDeviceRegistry watches;
    TelephonyNetworkInfo telephony;
    Locale locale;
    BundleLookup bundles;
    Queues queues{clock, failures};
    AccountStore accounts{queues, interference};
    AccountSession accountSession;
    HttpSessions http{clock, queues, files, interference};
    ServiceListenerFactory listener{queues, failures, interference};
    Store store{queues};
    PurchaseHistory purchaseHistory{queues};
    InstalledApps installedApps;
    LocalizedStrings localizedStrings;
    BackgroundActivities activities{clock, queues, interference};
    NotificationCenter notifications{queues, interference};
    codec::Json json;
    codec::PropertyList propertyList;
    codec::Digest digest;
    UuidSource uuids;
    Process process{queues, defaults, activities, notifications, http};
    platform::Platform platform;

private:
    struct Told {
        std::string language;
        std::set<std::string> watches;
    };
    void compare();

    platform::ScopedPlatform scope_;
    std::optional<Told> told_;
};

}  // namespace vrx::sim
