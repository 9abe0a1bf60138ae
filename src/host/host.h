// The Linux host: owns every facility, and is the program's current platform while it is alive. Made on the main thread
// before any other thread, and taken down there.
//
//     Host host({.home = home, .profile = profile});
//     if (MaybeError error = host.open(HomeUse::Agent)) …        // tell, and exit
//     host.setServiceListenerFactory(…);                         // before anything asks for it
//     …                                                          // the agent's start-up
//     host.start(version);
//     host.mainLoop().run();
#pragma once

#include <string>

#include "vrx/codec/codec.h"
#include "vrx/host/account/account_session.h"
#include "vrx/host/account/account_store.h"
#include "vrx/host/activities/background_activities.h"
#include "vrx/host/activities/machine_conditions.h"
#include "vrx/host/base/files.h"
#include "vrx/host/base/notification_center.h"
#include "vrx/host/base/uuid.h"
#include "vrx/host/home/database.h"
#include "vrx/host/home/defaults_store.h"
#include "vrx/host/home/follow_up_controller.h"
#include "vrx/host/home/home_lock.h"
#include "vrx/host/http/http.h"
#include "vrx/host/http/marketplace.h"
#include "vrx/host/log/system_log.h"
#include "vrx/host/loop/file_watch.h"
#include "vrx/host/loop/main_loop.h"
#include "vrx/host/loop/process_lifecycle.h"
#include "vrx/host/loop/queues.h"
#include "vrx/host/profile/clock.h"
#include "vrx/host/profile/device_profile.h"
#include "vrx/host/profile/installed_apps.h"
#include "vrx/host/profile/localized_strings.h"
#include "vrx/host/profile/profile_notifier.h"
#include "vrx/host/profile/telephony_network_info.h"
#include "vrx/platform/bundle_lookup.h"
#include "vrx/platform/platform.h"
#include "vrx/platform/service_listener.h"

namespace vrx::host {

struct HostLocations {
    std::string home;     // absolute, without a slash at its end
    std::string profile;  // empty for the bare machine's facts
};

struct HostLimits {
    HttpLimits http{};
    platform::Duration credentialHelper = std::chrono::seconds(60);
};

// The agent has a home to itself; its tools look in and may change settings beside it.
enum class HomeUse { Agent, Tool };

class Host {
public:
    explicit Host(const HostLocations& locations, platform::Level lowestLevel = platform::Level::Default,
                  const HostLimits& limits = {});
    // Ends what is under way: requests go unanswered, renewals of credentials fail, running tasks are waited for.
    ~Host();
    Host(const Host&) = delete;
    Host& operator=(const Host&) = delete;

    // Makes the home if need be, locks it for an agent, and opens the database. An error's text is for people.
    platform::MaybeError open(HomeUse use);

    // What the IPC side adds, before any other thread uses the platform; not owned.
    void setServiceListenerFactory(platform::ServiceListenerFactory* factory);
    void setBundleLookup(platform::BundleLookup* lookup);

    // For an agent of that version, when its start-up is done: activities fire from now on, and what has changed while
    // no agent ran is notified. Once.
    void start(const std::string& agentVersion);

    MainLoop& mainLoop() { return mainLoop_; }
    ProcessLifecycle& lifecycle() { return lifecycle_; }
    const DeviceProfile& profile() const { return profile_; }
    Database& database() { return database_; }
    const std::string& home() const { return home_; }
    // For the program that this process executes next.
    Descriptor releaseHomeLock() { return lock_.release(); }

private:
    const std::string home_;
    SystemLog log_;
    // The current platform from here on, so that what follows can log from its beginning to its end.
    platform::Platform::Facilities facilities_;
    platform::Platform platform_;
    platform::ScopedPlatform current_;

    codec::Json json_;
    codec::PropertyList propertyList_;
    codec::Digest digest_;
    MainLoop mainLoop_;  // takes over signals before the first thread
    ProcessLifecycle lifecycle_{mainLoop_};
    Queues queues_;
    HomeLock lock_;
    Files files_;
    Database database_;
    DefaultsStore defaults_;
    FollowUpControllers followUps_;
    DeviceProfile profile_;
    AccountStore accounts_;
    AccountSession accountSession_;
    Clock clock_;
    HttpSessions http_;
    UuidSource uuids_;
    TelephonyNetworkInfo telephony_{profile_};
    NotificationCenter notifications_;
    ProfileNotifier profileNotifier_{profile_, database_, notifications_};
    MachineConditions conditions_;
    BackgroundActivities activities_;
    std::unique_ptr<FileWatch> databaseWatch_;
    Marketplace marketplace_;
    PurchaseHistory purchases_;
    InstalledApps apps_;
    LocalizedStrings strings_;
};

}  // namespace vrx::host
