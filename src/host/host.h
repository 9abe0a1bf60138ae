// The Linux host: owns every facility, and is the program's current platform while it is alive. Made on the main thread
// before any other thread, and destroyed there.
//
//     Host host({.home = home, .profile = profile});
//     if (MaybeError error = host.open(HomeUse::Agent)) …        // tell, and exit
//     host.setServiceListenerFactory(…);                         // before anything asks for it
//     …                                                          // the agent's start-up
//     host.start(version);
//     host.mainLoop().run();
#pragma once

#include <functional>
#include <optional>
#include <string>
#include <vector>

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
    std::string home;                  // absolute, without a slash at its end
    std::vector<std::string> profile;  // its layers, as ProfileLayers takes them; none for the machine's own facts
    // The system bus's address, empty for the usual one. Nothing where the machine's services are not to be asked.
    std::optional<std::string> systemBus = {};
    std::string machineRoot = {};  // tests pass another root than "/" for the machine's files
};

struct HostLimits {
    HttpLimits http{};
    platform::Duration credentialHelper = std::chrono::seconds(60);
};

// An agent has the home to itself. Tools read it, and may change settings, beside an agent.
enum class HomeUse { Agent, Tool };

class Host {
public:
    explicit Host(const HostLocations& locations, platform::Level lowestLevel = platform::Level::Default,
                  const HostLimits& limits = {});
    // Ends what is under way: requests are dropped, renewals of credentials fail, running tasks are waited for.
    ~Host();
    Host(const Host&) = delete;
    Host& operator=(const Host&) = delete;

    // Makes the home if need be, locks it for an agent, and opens the database. An error's text is for people.
    platform::MaybeError open(HomeUse use);

    // Set by the IPC side, before any other thread uses the platform. Not owned.
    void setServiceListenerFactory(platform::ServiceListenerFactory* factory);
    void setBundleLookup(platform::BundleLookup* lookup);

    // Starts the work of an agent of that version, once its start-up is done: activities fire from now on, and what has
    // changed while no agent ran is notified. Once.
    void start(const std::string& agentVersion);

    // To be called on the main thread after each edit of the profile, and each answer of the machine's services, once
    // what it means to the agent has been notified. Set on the main thread.
    void setOnProfileEdit(std::function<void()> onProfileEdit) { onProfileEdit_ = std::move(onProfileEdit); }

    MainLoop& mainLoop() { return mainLoop_; }
    ProcessLifecycle& lifecycle() { return lifecycle_; }
    const DeviceProfile& profile() const { return profile_; }
    Database& database() { return database_; }
    const std::string& home() const { return home_; }
    // Gives up the lock, for the program that this process executes next.
    Descriptor releaseHomeLock() { return lock_.release(); }

private:
    bool usesSystemBus() const { return systemBus_ && profile_.content()->usesSystemBus; }
    void learnKeptFacts(HomeUse use);
    void followServices();
    void takeFacts();

    const std::string home_;
    const std::optional<std::string> systemBus_;
    SystemLog log_;
    // The current platform from here on, so that the members below can log during all of their life.
    platform::Platform::Facilities facilities_;
    platform::Platform platform_;
    platform::ScopedPlatform current_;

    codec::Json json_;
    codec::PropertyList propertyList_;
    codec::Digest digest_;
    MainLoop mainLoop_;  // blocks signals before the first thread starts
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
    MachineServices services_;
    MachineConditions conditions_;
    BackgroundActivities activities_;
    std::unique_ptr<FileWatch> homeWatch_;
    std::function<void()> onProfileEdit_;
    Marketplace marketplace_;
    PurchaseHistory purchases_;
    InstalledApps apps_;
    LocalizedStrings strings_;
};

}  // namespace vrx::host
