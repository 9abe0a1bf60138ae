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

#include "codec/codec.h"
#include "host/account_session.h"
#include "host/account_store.h"
#include "host/background_activities.h"
#include "host/clock.h"
#include "host/database.h"
#include "host/defaults_store.h"
#include "host/device_profile.h"
#include "host/file_watch.h"
#include "host/files.h"
#include "host/follow_up_controller.h"
#include "host/home_lock.h"
#include "host/http.h"
#include "host/installed_apps.h"
#include "host/localized_strings.h"
#include "host/machine_conditions.h"
#include "host/main_loop.h"
#include "host/notification_center.h"
#include "host/process_lifecycle.h"
#include "host/profile_notifier.h"
#include "host/queues.h"
#include "host/store.h"
#include "host/system_log.h"
#include "host/telephony_network_info.h"
#include "host/uuid.h"
#include "platform/bundle_lookup.h"
#include "platform/platform.h"
#include "platform/service_listener.h"

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
    Store store_;
    PurchaseHistory purchases_;
    InstalledApps apps_;
    LocalizedStrings strings_;
};

}  // namespace vrx::host
