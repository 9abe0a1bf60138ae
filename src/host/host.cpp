#include "vrx/host/host.h"

#include <unistd.h>

#include <filesystem>

#include "vrx/host/home/stored_facts.h"

namespace vrx::host {

using platform::MaybeError;
using platform::Platform;

// The platform gets its facilities once all exist. Until then it can only log.
Host::Host(const HostLocations& locations, platform::Level lowestLevel, const HostLimits& limits)
    : home_(locations.home),
      log_(lowestLevel),
      facilities_{.systemLog = &log_},
      platform_(facilities_),
      current_(platform_),
      queues_(mainLoop_),
      files_(home_),
      database_(home_ + "/host.db"),
      defaults_(database_),
      followUps_(database_),
      profile_(locations.profile),
      accounts_(profile_, home_, limits.credentialHelper),
      accountSession_(profile_),
      clock_(profile_),
      http_(queues_.workers(platform::Priority::UserInitiated), clock_, profile_, limits.http),
      conditions_(mainLoop_.event(), profile_),
      activities_({.database = database_,
                   .mainQueue = mainLoop_,
                   .workers = queues_.workers(platform::Priority::Background),
                   .conditions = conditions_,
                   .lifecycle = lifecycle_}),
      marketplace_(profile_),
      purchases_(profile_),
      apps_(profile_),
      strings_(profile_) {
    facilities_.accountSession = &accountSession_;
    facilities_.accountStore = &accounts_;
    facilities_.backgroundActivities = &activities_;
    facilities_.clock = &clock_;
    facilities_.defaultsStore = &defaults_;
    facilities_.deviceProperties = &profile_;
    facilities_.digest = &digest_;
    facilities_.featureFlags = &profile_;
    facilities_.files = &files_;
    facilities_.followUpControllers = &followUps_;
    facilities_.httpSessions = &http_;
    facilities_.installedApps = &apps_;
    facilities_.json = &json_;
    facilities_.locale = &profile_;
    facilities_.localizedStrings = &strings_;
    facilities_.notificationCenter = &notifications_;
    facilities_.pairedDeviceRegistry = &profile_;
    facilities_.processLifecycle = &lifecycle_;
    facilities_.propertyList = &propertyList_;
    facilities_.purchaseHistory = &purchases_;
    facilities_.queues = &queues_;
    facilities_.store = &marketplace_;
    facilities_.telephonyNetworkInfo = &telephony_;
    facilities_.uuidSource = &uuids_;
    platform_ = Platform(facilities_);
}

// Tasks may use any facility, and the current platform, to their end, so they end first. What a task may wait for ends
// before that.
Host::~Host() {
    http_.stop();
    accounts_.stop();
    queues_.stop();
}

MaybeError Host::open(HomeUse use) {
    if (MaybeError error = createDirectories(home_)) return error;
    if (use == HomeUse::Agent)
        if (MaybeError error = lock_.take(home_)) return error;
    profile_.content();  // reports mistakes now, and keeps the content for when an edit is wrong
    return database_.open();
}

// Watches the database's folder for tools' requests and for another database in its place. While there is no database
// it waits, because somebody may be replacing it.
void Host::start(const std::string& agentVersion) {
    sd_event_set_watchdog(mainLoop_.event(), 1);  // if the service manager asks for it
    constexpr platform::Duration pause = std::chrono::milliseconds(5);
    const std::string path = home_ + "/host.db";
    databaseWatch_ = std::make_unique<FileWatch>(mainLoop_.event(), std::vector{path}, pause, [this, path] {
        if (access(path.c_str(), F_OK) == 0) activities_.reconsider();
    });
    database_.write([this](Connection& connection) {
        setStoredFact(connection, stored_facts::profile,
                      profile_.path().empty() ? "" : std::filesystem::absolute(profile_.path()).string());
    });
    activities_.start(agentVersion);
    profileNotifier_.start(mainLoop_.event(), [this] { activities_.reconsider(); });
}

void Host::setServiceListenerFactory(platform::ServiceListenerFactory* factory) {
    facilities_.serviceListenerFactory = factory;
    platform_ = Platform(facilities_);
}

void Host::setBundleLookup(platform::BundleLookup* lookup) {
    facilities_.bundleLookup = lookup;
    platform_ = Platform(facilities_);
}

}  // namespace vrx::host
