// vrxhost why: the state of one device's follow-up, and the rule that decides it.
#include <algorithm>
#include <memory>
#include <set>

#include "timeline/document.h"
#include "timeline/timeline_text.h"
#include "vrx/coverage/cache_metadata.h"
#include "vrx/devices/devices_manager.h"
#include "vrx/devices/records/device_info.h"
#include "vrx/followup/follow_up_content.h"
#include "vrx/followup/serial_number_hashes.h"
#include "vrx/host/activities/machine_conditions.h"
#include "vrx/host/home/home_lock.h"
#include "vrx/platform/defaults_store.h"
#include "vrx/platform/sha256_hash.h"
#include "vrx/platform/text.h"
#include "vrx/platform/vendor.h"
#include "vrx/scheduling/outreach_activity.h"
#include "vrx/scheduling/post_date.h"
#include "vrx/scheduling/refresh_date.h"
#include "vrx/service/default_warranty_provider.h"
#include "vrxhost/agent_activities.h"
#include "vrxhost/agent_view.h"
#include "vrxhost/follow_up_explanation.h"
#include "vrxhost/home.h"
#include "vrxhost/home_play.h"
#include "vrxhost/moment.h"
#include "vrxhost/verbs.h"

namespace vrx::apps {

using platform::Date;
using platform::Dictionary;
using platform::Duration;
using platform::Platform;
using platform::Result;
using platform::Value;

namespace {

using DevicePtr = std::shared_ptr<VRXDevice>;
using InfoPtr = std::shared_ptr<VRXDeviceInfo>;

// A fixed time for which rules are evaluated.
class FixedClock final : public platform::Clock {
public:
    explicit FixedClock(Date now) : now_(now) {}
    Date now() const override { return now_; }
    std::chrono::seconds timeZoneOffset() const override { return Platform::current().clock().timeZoneOffset(); }

private:
    const Date now_;
};

struct CachedRecord {
    std::shared_ptr<VRXWarranty> record;  // also when it does not count
    std::optional<CachedRecordFlaw> flaw;
};

CachedRecord cachedRecord(const std::optional<std::string>& serialNumber) {
    VRXAgentDefaultWarrantyProvider provider(platform::vendorIdentifier(platform::settingsAppRemainder), {});
    const auto record = provider.cachedWarrantyForSerialNumber(serialNumber);
    return {record, record ? flawOfCachedRecord(provider, serialNumber) : std::nullopt};
}

InfoPtr infoOf(const DevicePtr& device) {
    const CachedRecord cached = cachedRecord(device->serialNumber());
    return VRXDeviceInfo::deviceInfoWithDevice(device, cached.flaw ? nullptr : cached.record);
}

// The settings that the post rules use.
struct PostSettings {
    std::set<std::string> dismissed = serialNumberHashes(dismissedSerialNumberHashesKey);
    PostDateSettings dates = PostDateSettings::read();
};

PostDecision decide(const VRXDeviceInfo& info, const PostSettings& settings, const platform::Clock& clock) {
    const std::string hash = platform::sha256Hash(info.device()->serialNumber().value_or(""));
    return decidePost(
        info, {.isDismissed = settings.dismissed.contains(hash), .outreachDelay = settings.dates.outreachDelay}, clock);
}

// The post that an outreach at that date schedules: when the first offer is due that it finds, if the records stay as
// they are. Null when it finds none.
std::optional<Date> postAfterOutreach(const DeviceInfoList& infos, Date outreach) {
    std::optional<Date> first;
    for (const InfoPtr& info : infos) {
        const auto record = info->warranty();
        if (!record || !record->qxOfferDisplay()) continue;
        if (!VRXOutreachActivity::currentDeviceShouldReceiveOutreachForWarranty(*record)) continue;
        const std::optional<Date> due = dueDateInRecord(*record);
        if (due && *due < first.value_or(Date::max())) first = due;
    }
    return first ? std::optional(std::max(*first, outreach)) : std::nullopt;
}

// Predicts when the device's follow-up is posted, by the run at that date or by the runs that follow from it, if the
// records stay as they are.
std::optional<Date> predictedPosting(const std::string& serialNumber, const DeviceInfoList& infos,
                                     PostSettings settings, Date run, Duration interval) {
    constexpr int mostRuns = 1000;
    for (int count = 0; count < mostRuns; ++count) {
        for (const InfoPtr& info : infos) {
            if (decide(*info, settings, FixedClock(run)).reason != PostReason::Due) continue;
            if (info->device()->serialNumber() == serialNumber) return run;
            settings.dates.postedSerialNumberHashes.insert(
                platform::sha256Hash(info->device()->serialNumber().value_or("")));
        }
        const std::optional<Date> next = nextPostDate(infos, settings.dates, run);
        if (!next) return std::nullopt;
        run = std::max(*next, run + interval);
    }
    return std::nullopt;
}

Value valueOf(const std::optional<Date>& date) {
    return date ? Value(*date) : Value();
}

const char* nameOf(FollowUpState state) {
    switch (state) {
        case FollowUpState::Shown: return "shown";
        case FollowUpState::Dismissed: return "dismissed";
        case FollowUpState::Waiting: return "waiting";
        case FollowUpState::NotOffered: return "not-offered";
    }
    return "";
}

// What decides about one device, and what is shown of it.
struct Findings {
    FollowUpCircumstances circumstances;
    std::optional<std::string> name{};
    std::vector<std::pair<const char*, Value>> inputs{};
    std::optional<Date> nextPost{}, nextRefresh{};
};

struct Activities {
    const AgentActivity& outreach;
    const AgentActivity& post;
    const AgentActivity& refresh;
};

Result<std::set<std::string>> pendingSerialNumbers() {
    const auto items =
        Platform::current().followUpControllers().makeController(followUpClientIdentifier())->pendingFollowUpItems();
    if (!items) return items.error();
    std::set<std::string> serialNumbers;
    for (const platform::FollowUpItem& item : *items)
        if (const std::string* serialNumber = serialNumberOfItem(item)) serialNumbers.insert(*serialNumber);
    return serialNumbers;
}

void addRecord(Findings& findings, const CachedRecord& cached, const std::string& serialNumber) {
    auto metadata = [&](std::string_view key) {
        return Platform::current().defaultsStore().get(cacheMetadataKey(serialNumber, key));
    };
    auto add = [&](const char* name, Value value) { findings.inputs.emplace_back(name, std::move(value)); };
    add("recordStored", metadata(cachedWarrantyLastUpdatedDateKey));
    add("recordLanguage", metadata(cachedWarrantyLocaleKey));
    add("language", Platform::current().locale().preferredLocaleIdentifier());
    add("signedIn", Platform::current().accountStore().primaryCloudAccount().has_value());
    if (!cached.record) return;
    const VRXWarranty& record = *cached.record;
    add("qxOfferDisplay", record.qxOfferDisplay());
    add("qxOfferEligibleUntil", valueOf(record.qxOfferEligibleUntil()));
    add("qxOfferFollowupDisplayDate", valueOf(record.qxOfferFollowupDisplayDate()));
    add("qxOfferDurationBeforeEndDate", record.qxOfferDurationBeforeEndDate().count());
    add("qxOfferToggle", record.qxOfferToggle());
    findings.circumstances.eligibleUntil = record.qxOfferEligibleUntil();
    findings.circumstances.displayDate = record.qxOfferFollowupDisplayDate();
    findings.circumstances.isCarrierOut = !VRXOutreachActivity::currentDeviceShouldReceiveOutreachForWarranty(record);
}

// Evaluates the agent's own rules with what it would read now; stores nothing.
Findings examine(const std::string& serialNumber, const std::set<std::string>& pending, const Activities& activities,
                 Duration minimumInterval) {
    const platform::Clock& clock = Platform::current().clock();
    const DevicesBySerialNumber devices = VRXDevicesManager::sharedManager()->allDevices();
    const auto found = devices.find(serialNumber);
    const DevicePtr device = found != devices.end() ? found->second
                                                    : VRXDevice::deviceWithName(std::nullopt, serialNumber,
                                                                                std::nullopt, VRXDeviceTypeOther);
    DeviceInfoList infos, shown;
    for (const auto& [number, each] : devices) {
        infos.push_back(infoOf(each));
        if (pending.contains(number)) shown.push_back(infos.back());
    }
    const CachedRecord cached = cachedRecord(serialNumber);
    const InfoPtr info = infoOf(device);
    const PostSettings settings;

    Findings findings{.circumstances = {.now = clock.now()}, .name = device->name()};
    FollowUpCircumstances& state = findings.circumstances;
    state.isTracked = found != devices.end();
    state.isPending = pending.contains(serialNumber);
    state.wasPosted = settings.dates.postedSerialNumberHashes.contains(platform::sha256Hash(serialNumber));
    state.hasRecord = cached.record != nullptr;
    state.recordFlaw = cached.flaw;
    state.post = decide(*info, settings, clock);
    state.refresh = decideRefresh(*info, {.isPending = state.isPending}, clock);
    state.outreach = activities.outreach.nextRun();
    state.postRun = activities.post.nextRun();
    // An outreach that comes first schedules the post anew.
    std::optional<Date> post = state.postRun;
    if (state.outreach && (!post || *state.outreach < *post))
        if (const auto anew = postAfterOutreach(infos, std::max(state.now, *state.outreach))) {
            post = anew;
            state.postRun.reset();
        }
    if (post)
        state.posting = predictedPosting(serialNumber, infos, settings, std::max(state.now, *post), minimumInterval);

    findings.nextPost = nextPostDate(infos, settings.dates, state.now);
    findings.nextRefresh = nextRefreshDate(shown, true, RefreshDateSettings::read(), state.now);
    findings.inputs = {{"now", state.now},
                       {"activationDate", valueOf(device->activationDate())},
                       {"PostUpgradeOutreachDelay", settings.dates.outreachDelay.count()},
                       {"postDate", state.post.dueDate ? Value(state.post.dueDate->date) : Value()},
                       {"pending", state.isPending},
                       {"posted", state.wasPosted},
                       {"dismissed", settings.dismissed.contains(platform::sha256Hash(serialNumber))}};
    addRecord(findings, cached, serialNumber);
    findings.inputs.emplace_back("carrierLeftOut", state.isCarrierOut);
    return findings;
}

const AgentActivity* activityOf(NextStep step, const Activities& activities) {
    switch (step) {
        case NextStep::Outreach: return &activities.outreach;
        case NextStep::Post: return &activities.post;
        case NextStep::Refresh: return &activities.refresh;
        case NextStep::None: break;
    }
    return nullptr;
}

std::string headline(const FollowUpExplanation& explanation) {
    const std::string until = explanation.until ? " until " + platform::describe(*explanation.until) : "";
    switch (explanation.state) {
        case FollowUpState::Shown: return "shown" + until;
        case FollowUpState::Dismissed: return "dismissed";
        case FollowUpState::Waiting: return "waits" + until;
        case FollowUpState::NotOffered: return "not offered";
    }
    return "";
}

// The next activity is named only when it is scheduled. Without an agent, starting one comes before any other advice.
Outcome report(const std::string& serialNumber, const Findings& findings, const Activities& activities,
               bool isAgentRunning) {
    FollowUpExplanation explanation = explainFollowUp(findings.circumstances);
    const AgentActivity* next = activityOf(explanation.next, activities);
    if (next && !next->due) next = nullptr;
    if (next && !isAgentRunning) explanation.advice = "Start an agent on this home: without one nothing runs.";

    Outcome outcome;
    outcome.text = printable(serialNumber) + (findings.name ? ", " + printable(*findings.name) : "") + ": " +
                   headline(explanation) + "\n";
    auto line = [&](const std::string& name, const std::string& content) {
        outcome.text += "  " + name + std::string(name.size() < 30 ? 30 - name.size() : 1, ' ') + content + "\n";
    };
    line("because", explanation.text + "  (" + explanation.rule + ")");
    line("next", next ? next->identifier + ", " + platform::describe(*next->nextRun()) +
                            (next->scheduled->criteria.requiresNetwork ? ", once the network is there" : "")
                      : "nothing is scheduled for it");
    Dictionary inputs;
    for (const auto& [name, value] : findings.inputs) {
        inputs[name] = value;
        line(name, value.isNull() ? "none" : printableValue(value));
    }
    if (!explanation.advice.empty()) outcome.text += explanation.advice + "\n";
    outcome.document = {
        {"serialNumber", serialNumber},
        {"name", findings.name ? Value(*findings.name) : Value()},
        {"state", nameOf(explanation.state)},
        {"rule", explanation.rule},
        {"reason", explanation.text},
        {"until", valueOf(explanation.until)},
        {"next", next ? Value(Dictionary{{"identifier", next->identifier},
                                         {"date", *next->nextRun()},
                                         {"requiresNetwork", next->scheduled->criteria.requiresNetwork}})
                      : Value()},
        {"inputs", inputs},
        {"nextPostDate", valueOf(findings.nextPost)},
        {"nextRefreshDate", valueOf(findings.nextRefresh)},
        {"agentRunning", isAgentRunning},
        {"advice", explanation.advice}};
    return outcome;
}

struct WhyOptions {
    std::string serialNumber;
    std::string moment;
};

Outcome explain(const std::string& serialNumber, const std::vector<AgentActivity>& all, const AgentView& view,
                bool isAgentRunning) {
    const Result<std::set<std::string>> pending = pendingSerialNumbers();
    if (!pending) return databaseFailure(pending.error(), "not-read");
    const Activities activities{activityNamed(all, "outreach"), activityNamed(all, "followuppost"),
                                activityNamed(all, "followuprefresh")};
    const Findings findings = examine(serialNumber, *pending, activities, host::minimumInterval(view.profile()));
    return report(serialNumber, findings, activities, isAgentRunning);
}

Outcome whyNow(AgentView& view, const std::string& serialNumber) {
    const Result<std::vector<AgentActivity>> all = agentActivities(view);
    if (!all) return databaseFailure(all.error(), "not-read");
    return explain(serialNumber, *all, view, host::HomeLock::isInUse(view.home()));
}

void addLook(Outcome& outcome, const timeline::Chronicle& chronicle, const std::string& serialNumber) {
    outcome.document["shown"] = nullptr;
    const auto lane = std::ranges::find(chronicle.devices, serialNumber, &timeline::DeviceLane::serialNumber);
    if (lane == chronicle.devices.end() || lane->shown.empty() || lane->shown.back().until) return;
    const timeline::Shown& look = lane->shown.back();
    outcome.document["shown"] = timeline::documentOf(look);
    outcome.text += "Shown as\n  " + printable(look.title) + (look.hasBadge ? "  [badge]" : "") +
                    (look.isExpired ? "  [expired]" : "") + "\n  " + printable(look.text) + "\n";
}

// The agent's own rules at a moment to come, with what a play of the home has come to by then.
Outcome whyThen(AgentView& view, const WhyOptions& options) {
    const Result<HomeState> state = readHomeState(view);
    if (!state) return databaseFailure(state.error(), "not-read");
    const std::optional<Date> moment = momentFrom(options.moment, state->now.wall);
    if (!moment || *moment < state->now.wall)
        return failed(ExitCode::Usage, "--at names a moment that is over", "Of the past only the last runs are known.");
    HomePlay play(*state, view);
    play.playUntil(*moment);
    if (!play.failure().empty() || play.isCutShort())
        return failed(ExitCode::NoAnswer,
                      play.isCutShort() ? "too much happens before that moment" : "the play failed: " + play.failure(),
                      "vrxhost timeline shows how far it can be told.", "failed");
    Outcome outcome = explain(options.serialNumber, play.activities(), view, state->isAgentRunning);
    const timeline::Chronicle chronicle = play.chronicle();
    addLook(outcome, chronicle, options.serialNumber);
    outcome.document["assumptions"] = platform::Array(chronicle.assumptions.begin(), chronicle.assumptions.end());
    outcome.text += timeline::assumptionsText(chronicle);
    return outcome;
}

}  // namespace

void addWhyVerb(CommandLine& line, const wire::LocationOverrides& places) {
    auto options = std::make_shared<WhyOptions>();
    auto profile = std::make_shared<std::optional<std::string>>();
    CLI::App* verb =
        line.add("why", "Tells why a device's follow-up is shown, or is not",
                 readOnlyVerb(places, profile, [options](AgentView& view) {
                     return options->moment.empty() ? whyNow(view, options->serialNumber) : whyThen(view, *options);
                 }));
    verb->add_option("SERIAL", options->serialNumber, "The device's serial number")->required();
    verb->add_option("--at", options->moment, "The same at a moment to come, such as 2027-03-01 or +30d")
        ->type_name("DATE")
        ->check(momentMistake, "");
    addProfileOption(verb, *profile);
}

}  // namespace vrx::apps
