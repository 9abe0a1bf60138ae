#include "vrx/host/host.h"

#include <sys/stat.h>
#include <unistd.h>

#include <filesystem>

#include "vrx/host/base/trust.h"
#include "vrx/host/bus/hardware_serial.h"
#include "vrx/host/home/kept_facts.h"
#include "vrx/host/home/stored_facts.h"
#include "vrx/platform/log.h"

namespace vrx::host {

using platform::MaybeError;
using platform::Platform;

// The platform gets its facilities once all exist. Until then it can only log.
Host::Host(const HostLocations& locations, platform::Level lowestLevel, const HostLimits& limits)
    : home_(locations.home),
      systemBus_(locations.systemBus),
      log_(lowestLevel),
      facilities_{.systemLog = &log_},
      platform_(facilities_),
      current_(platform_),
      queues_(mainLoop_),
      files_(home_),
      database_(home_ + "/host.db"),
      defaults_(database_),
      followUps_(database_),
      profile_(locations.profile, locations.machineRoot),
      accounts_(profile_, home_, limits.credentialHelper),
      accountSession_(profile_),
      clock_(profile_),
      http_(queues_.workers(platform::Priority::UserInitiated), clock_, profile_, limits.http),
      services_(mainLoop_.event(), systemBus_.value_or("")),
      conditions_(mainLoop_.event(), profile_, services_),
      activities_({.database = database_,
                   .mainLoop = mainLoop_,
                   .workers = queues_.workers(platform::Priority::Background),
                   .conditions = conditions_,
                   .lifecycle = lifecycle_}),
      marketplace_(profile_),
      purchases_(profile_),
      apps_(profile_),
      strings_(profile_) {
    defaults_.setPresets([this] { return profile_.defaults(); });
    lifecycle_.setMainQueue(queues_.weakMainQueue());
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
    if (use == HomeUse::Agent) {
        if (MaybeError error = lock_.take(home_)) return error;
        struct stat status;
        if (stat(home_.c_str(), &status) == 0)
            if (const auto open = findOpenToOthers(home_, status)) log(platform::Level::Error, "%@", open->error.text);
    }
    profile_.content();  // reports mistakes now, and keeps the content for when an edit is wrong
    if (const auto missing = use == HomeUse::Agent ? profile_.missingFile() : std::nullopt)
        log(platform::Level::Error, "The device profile %@ is not there: the machine's own facts hold", *missing);
    if (MaybeError error = database_.open()) return error;
    learnKeptFacts(use);
    return std::nullopt;
}

// What services have told before holds until they tell something else. The serial number is waited for where nothing
// else tells it: the start-up needs it, and a device that changes its number is another one to the server.
void Host::learnKeptFacts(HomeUse use) {
    constexpr std::chrono::seconds longestWait(5);
    const std::string machine = profile_.machine().identifier();
    ToldFacts facts;
    database_.read([&](Connection& connection) { facts = keptFacts(connection, machine); });
    const bool isNumbered = facts.serialNumber || profile_.content()->serialNumber || profile_.machine().serialNumber();
    if (use == HomeUse::Agent && usesSystemBus() && !isNumbered) {
        facts.serialNumber = askHardwareSerial(*systemBus_, longestWait);
        if (facts.serialNumber) database_.write([&](Connection& connection) { keepFacts(connection, machine, facts); });
    }
    profile_.tell(std::move(facts));
}

// Watches the home for tools' requests, for another database in its place, and for another agent's lock. While there is
// no database it waits, because somebody may be replacing it.
void Host::start(const std::string& agentVersion) {
    sd_event_set_watchdog(mainLoop_.event(), 1);  // if the service manager asks for it
    constexpr platform::Duration pause = std::chrono::milliseconds(5);
    const std::string path = home_ + "/host.db";
    const std::vector<std::string> watched{path, home_ + "/lock"};
    homeWatch_ = std::make_unique<FileWatch>(mainLoop_.event(), watched, pause, [this, path] {
        if (lock_.isLost(home_)) {
            log(platform::Level::Error, "The home %@ was taken away from this agent, which begins anew", home_);
            activities_.abandon();
            lifecycle_.exitCleanWhenIdle();
        } else if (access(path.c_str(), F_OK) == 0) {
            activities_.reconsider();
        }
    });
    std::string layers;
    for (const std::string& layer : profile_.layers())
        layers += (layers.empty() ? "" : "\n") + std::filesystem::absolute(layer).string();
    database_.write([&](Connection& connection) { setStoredFact(connection, stored_facts::profile, layers); });
    activities_.start(agentVersion);
    if (usesSystemBus()) followServices();
    profileNotifier_.start(mainLoop_.event(), [this] {
        activities_.reconsider();
        if (onProfileEdit_) onProfileEdit_();
    });
}

// Until the services have answered, nobody is told that the language or the watches are others.
void Host::followServices() {
    constexpr std::chrono::seconds longestWait(5);
    services_.followFacts(*profile_.told(), geteuid(), localeIdentifierFromPosix, [this] { takeFacts(); });
    services_.start();
    if (services_.hasBus() && !services_.areFactsSettled()) profileNotifier_.holdFor(longestWait);
}

void Host::takeFacts() {
    ToldFacts facts = services_.facts();
    if (facts != *profile_.told()) profile_.tell(std::move(facts));
    services_.areFactsSettled() ? profileNotifier_.release() : profileNotifier_.factsChanged();
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
