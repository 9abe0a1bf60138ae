#include "vrxhost/home_play.h"

#include <algorithm>

#include "vrx/codec/property_list.h"
#include "vrx/coverage/records/warranty.h"
#include "vrx/devices/devices_manager.h"
#include "vrx/devices/records/device.h"
#include "vrx/followup/follow_up_content.h"
#include "vrx/host/activities/machine_conditions.h"
#include "vrx/platform/settings_keys.h"
#include "vrx/platform/sha256_hash.h"
#include "vrx/platform/text.h"
#include "vrx/platform/url.h"
#include "vrx/platform/vendor.h"
#include "vrx/serverversion/server_version_utilities.h"
#include "vrx/service/cached_record.h"
#include "vrx/service/default_warranty_provider.h"
#include "vrx/service/register_defaults.h"
#include "vrx/service/start_up.h"

namespace vrx::apps {

using platform::Date;
using platform::Dictionary;
using platform::Duration;
using platform::Value;

namespace {

// The simulated files from which the agent of the play has what a server answers.
constexpr const char* recordsUrl = "file:///server/Warranty.plist";
constexpr const char* versionsUrl = "file:///server/ServerVersion.plist";
// More than an activity makes in a year that runs again and again at once, a quarter of an hour apart. Test settings
// can make days and pauses of seconds: then there is no end to what happens.
constexpr std::size_t mostRuns = 40'000;
constexpr Duration step = std::chrono::hours(1), quietTime = std::chrono::days(1);

std::string propertyList(const Value& root) {
    const auto data = platform::Platform::current().propertyList().serialize(root, platform::PropertyListFormat::Xml);
    return data ? std::string(data->begin(), data->end()) : "";
}

std::optional<std::string> fileOfRecord(const std::string& serialNumber) {
    const auto url = platform::Url::parse(recordsUrl);
    return url->withPathExtension(platform::filled("%@.%@", {serialNumber, url->pathExtension()})).filePath();
}

// As they were negotiated last, else all that the agent knows.
Value serverVersions() {
    namespace settings = platform::settings;
    const platform::DefaultsStore& defaults = platform::Platform::current().defaultsStore();
    Value negotiated = defaults.get(serverVersionCacheKey);
    if (negotiated.asDictionary()) return negotiated;
    Dictionary versions;
    for (const std::string_view key : {settings::lowServerVersion, settings::highServerVersion})
        versions[std::string(key)] = defaults.integer(key);
    return versions;
}

std::string fileOf(const char* url) {
    return platform::Url::parse(url)->filePath().value_or("");
}

// What is otherwise at present.
std::string butNow(const MachineSituation& machine) {
    std::string text;
    if (!machine.isNetworkAvailable) text += " Now there is no network, says " + machine.networkJudge + ".";
    if (machine.shouldDefer) text += " Now deferral is asked for, says " + machine.deferralJudge + ".";
    return text;
}

std::string joined(const std::vector<std::string>& words) {
    std::string text;
    for (const std::string& word : words) text += (text.empty() ? "" : ", ") + word;
    return text;
}

}  // namespace

HomePlay::HomePlay(const HomeState& state, const AgentView& view) : state_(state), quietAfter_(state.now.wall) {
    host_.failures.handler = [this](const std::string& text) {
        if (failure_.empty()) failure_ = text;
        host_.queues.stop();
    };
    host_.log.lowest = platform::Level::Error;  // composing what nobody reads would take most of the time
    host_.clock.set(state_.now.wall);
    takeDevice(view);
    takeSettings(view);
    takeRecords(view);
    host_.followUps.pending(followUpClientIdentifier()) = state_.items;
    takeActivities(host::minimumInterval(view.profile()));
    recorder_ = std::make_unique<timeline::Recorder>(host_);
    recorder_->look();
    host_.process.launch([] { return std::make_shared<StartUp>(); });
    if (!state_.isAgentRunning)
        for (const std::string& name : state_.owedNotifications) host_.notifications.raise(name);
}

HomePlay::~HomePlay() {
    recorder_.reset();
    host_.queues.letWaitingTasksGo();
}

void HomePlay::takeDevice(const AgentView& view) {
    const host::DeviceProfile& profile = view.profile();
    host_.device.strings.clear();
    for (const char* key : {"SerialNumber", "UserAssignedDeviceName", "ProductType", "ProductVersion"})
        if (const auto text = profile.string(key)) host_.device.strings[key] = *text;
    host_.device.isInternal = profile.isInternalInstall();
    if (profile.isEnabled("Vireo", "Meridian_3_0")) host_.flags.enabled.insert({"Vireo", "Meridian_3_0"});
    host_.watches.all = profile.watches();
    host_.telephony.carriers = state_.carriers;
    host_.accounts.primary = state_.account;
    host_.locale.identifier = state_.language;
    host_.clock.setTimeZoneOffset(state_.timeZoneOffset);
}

// A preset stands in for what is not stored.
void HomePlay::takeSettings(const AgentView& view) {
    const auto presets = view.profile().defaults();
    for (const auto& [key, value] : *presets) host_.defaults.set(key, value);
    for (const auto& [key, value] : state_.settings) host_.defaults.set(key, value);
    host_.defaults.set(platform::settings::warrantyURL, recordsUrl);
    host_.defaults.set(platform::settings::serverVersionURL, versionsUrl);
    vrx_registerDefaults(host_.defaults);
}

// What is cached stays so, and is what the server answers as far as it counts.
void HomePlay::takeRecords(const AgentView& view) {
    const std::size_t homeSize = host_.files.homeDirectory().size();
    const auto take = [&](const std::string& path) {
        if (const auto content = host::readFile(view.home() + path.substr(homeSize)))
            host_.files.put(path, content->text());
    };
    host_.files.put(fileOf(versionsUrl), propertyList(serverVersions()));
    take(VRXWarranty::_legacyWarrantyPath());
    VRXAgentDefaultWarrantyProvider provider(platform::vendorIdentifier(platform::settingsAppRemainder), {});
    for (const auto& [serialNumber, device] : VRXDevicesManager::sharedManager()->allDevices()) {
        take(platform::filled(VRXWarranty::_warrantyPathForSerialNumberFormat(), {platform::sha256Hash(serialNumber)}));
        const auto record = provider.cachedWarrantyForSerialNumber(serialNumber);
        const auto answer = fileOfRecord(serialNumber);
        if (!record || flawOfCachedRecord(provider, serialNumber) || !answer) {
            withoutRecord_.push_back(device->name().value_or(serialNumber));
            continue;
        }
        host_.files.put(*answer, propertyList(record->dictionaryRepresentation()));
        if (const auto end = record->qxOfferEligibleUntil()) quietAfter_ = std::max(quietAfter_, *end);
    }
}

// As a process finds them that starts now, in the present boot.
void HomePlay::takeActivities(Duration minimumInterval) {
    for (const host::ScheduledActivity& scheduled : state_.activities.scheduled) {
        const auto isItsRun = [&](const host::ActivityRun& run) {
            return run.generation == scheduled.generation && !run.ended;
        };
        const Duration left = timeLeft(carriedOver(scheduled.due, state_.now), state_.now);
        host_.activities.takeOver(
            scheduled.identifier,
            {.criteria = scheduled.criteria,
             .timeLeft = left,
             .deferrals = scheduled.deferrals,
             .isInterrupted = !state_.isAgentRunning && std::ranges::any_of(state_.activities.runs, isItsRun)});
        quietAfter_ = std::max(quietAfter_, state_.now.wall + left);
    }
    const std::string version = VRX_VERSION;
    host_.process.agentVersion = version;
    host_.activities.setMinimumInterval(minimumInterval);
    host_.activities.takeOverFired(state_.isAgentRunning ? version : state_.agentVersion.value_or(""),
                                   state_.isAgentRunning || state_.boot == state_.now.boot);
}

void HomePlay::playUntil(Date date) {
    while (now() < date && !isCutShort_ && failure_.empty()) {
        host_.runUntil(std::min(date, now() + step));
        host_.forgetRecords();
        isCutShort_ = recorder_->runCount() >= mostRuns;
    }
    const bool isNothingShown = host_.followUps.pending(followUpClientIdentifier()).empty();
    isOver_ = isNothingShown && (host_.activities.registered().empty() || now() > quietAfter_ + quietTime);
}

void HomePlay::playToTheEnd(Date latest) {
    while (now() < latest && !isOver_ && !isCutShort_ && failure_.empty()) playUntil(std::min(latest, now() + step));
    if (!isOver_) return;
    // Up to a moment after the last thing that happens, instead of the end of an hour in which nothing does.
    const Date last = std::min(latest, std::max(recorder_->lastChange(), quietAfter_));
    const Duration span = last - state_.now.wall;
    end_ = last + (span > Duration(0) ? span / 20 : quietTime);
}

timeline::Chronicle HomePlay::chronicle() {
    timeline::Chronicle chronicle = recorder_->chronicle();
    chronicle.now = state_.now.wall;
    chronicle.isComplete = isOver_;
    if (end_) chronicle.until = *end_;
    auto& assumptions = chronicle.assumptions;
    assumptions.push_back(
        "The machine is on, its network is there, and nothing asks for deferral, so no activity uses its grace "
        "period." +
        butNow(state_.machine));
    assumptions.push_back("The coverage server answers with the records that are cached" +
                          (withoutRecord_.empty() ? std::string(".")
                                                  : ". There is none that counts of " + joined(withoutRecord_) +
                                                        ": downloads of it fail."));
    assumptions.emplace_back("Nobody dismisses anything; devices, account, language and settings stay as they are.");
    if (!state_.isAgentRunning) assumptions.emplace_back("No agent has this home: one is started now.");
    if (isCutShort_)
        assumptions.push_back("So much happens that only the first " + std::to_string(recorder_->runCount()) +
                              " runs were played.");
    for (timeline::ActivityLane& lane : chronicle.activities)
        for (const host::ActivityRun& run : state_.activities.runs)
            if (run.identifier == lane.identifier)
                lane.lastRun = {run.began, run.ended, outcomeOf(run, state_.isAgentRunning)};
    return chronicle;
}

std::vector<AgentActivity> HomePlay::activities() const {
    std::vector<AgentActivity> activities = ownActivities();
    for (AgentActivity& activity : activities) {
        const auto left = host_.activities.timeLeft(activity.identifier);
        if (!left) continue;
        activity.due = now() + *left;
        activity.scheduled = host::ScheduledActivity{
            .identifier = activity.identifier, .criteria = *host_.activities.criteria(activity.identifier), .due = {}};
    }
    return activities;
}

}  // namespace vrx::apps
