#include "timeline/recorder.h"

#include <algorithm>
#include <cerrno>
#include <utility>

#include "vrx/codec/property_list.h"
#include "vrx/coverage/records/warranty.h"
#include "vrx/devices/devices_manager.h"
#include "vrx/devices/records/device.h"
#include "vrx/devices/records/device_info.h"
#include "vrx/followup/follow_up_content.h"
#include "vrx/followup/follow_up_rules.h"
#include "vrx/followup/serial_number_hashes.h"
#include "vrx/host/home/shown_follow_up.h"
#include "vrx/platform/sha256_hash.h"
#include "vrx/platform/vendor.h"
#include "vrx/scheduling/post_date.h"
#include "vrx/service/cached_record.h"
#include "vrx/service/default_warranty_provider.h"

namespace vrx::timeline {

using platform::Date;
using platform::Duration;
using platform::FollowUpItem;
using platform::Value;

namespace {

// With days of a few seconds an item's text can change more often than anybody would read: from then on it stands as it
// is.
constexpr std::size_t mostTexts = 50'000;
// Added to the moment of a change, so that rounding leaves no doubt of what it has changed to.
constexpr Duration justAfter{1e-3};

class NoLog final : public platform::SystemLog {
public:
    bool isOn(platform::Level) const override { return false; }
    void write(const platform::LogEntry&) override {}
};

class ReadSettings final : public platform::DefaultsStore {
public:
    explicit ReadSettings(const sim::DefaultsStore& store) : store_(store) {}
    Value get(std::string_view key) const override { return store_.get(key); }
    void set(std::string_view, Value) override {}
    void update(std::string_view, const std::function<Value(const Value&)>&) override {}
    void registerDefaults(const platform::Dictionary&) override {}
    platform::Dictionary dictionaryRepresentation() const override { return store_.dictionaryRepresentation(); }

private:
    const sim::DefaultsStore& store_;
};

// Past the faults that a simulation has scripted.
class ReadFiles final : public platform::Files {
public:
    explicit ReadFiles(const sim::Files& files) : files_(files) {}
    std::string homeDirectory() const override { return files_.homeDirectory(); }
    platform::Result<platform::Data> read(const std::string& path) const override {
        const std::optional<std::string> content = files_.content(path);
        if (!content) return platform::Error{platform::error_domain::system, ENOENT, path};
        return platform::Data(content->begin(), content->end());
    }
    platform::Result<Value> readPropertyList(const std::string& path) const override {
        const platform::Result<platform::Data> content = read(path);
        return content ? codec::parsePropertyList(*content) : content.error();
    }
    platform::MaybeError replace(const std::string&, const platform::Data&) override { return std::nullopt; }
    platform::MaybeError createDirectories(const std::string&) override { return std::nullopt; }
    platform::MaybeError remove(const std::string&) override { return std::nullopt; }

private:
    const sim::Files& files_;
};

// While it lives, the agent's rules read the simulated host, and the host does not notice.
class Unnoticed {
public:
    explicit Unnoticed(sim::Host& host)
        : host_(host),
          beforeCall_(std::exchange(host.interference.beforeCall, nullptr)),
          planted_(std::exchange(host.interference.planted, sim::Defect::None)),
          settings_(host.defaults),
          files_(host.files),
          platform_({.accountStore = &host.accounts,
                     .clock = &host.clock,
                     .defaultsStore = &settings_,
                     .deviceProperties = &host.device,
                     .digest = &host.digest,
                     .featureFlags = &host.flags,
                     .files = &files_,
                     .json = &host.json,
                     .locale = &host.locale,
                     .pairedDeviceRegistry = &host.watches,
                     .propertyList = &host.propertyList,
                     .systemLog = &log_,
                     .telephonyNetworkInfo = &host.telephony}),
          scope_(platform_) {}
    ~Unnoticed() {
        host_.interference.beforeCall = std::move(beforeCall_);
        host_.interference.planted = planted_;
    }
    Unnoticed(const Unnoticed&) = delete;
    Unnoticed& operator=(const Unnoticed&) = delete;

    const platform::DefaultsStore& settings() const { return settings_; }

private:
    sim::Host& host_;
    std::function<void()> beforeCall_;
    const sim::Defect planted_;
    NoLog log_;
    ReadSettings settings_;
    ReadFiles files_;
    platform::Platform platform_;
    platform::ScopedPlatform scope_;
};

std::shared_ptr<VRXWarranty> countingRecord(const std::string& serialNumber) {
    VRXAgentDefaultWarrantyProvider provider(platform::vendorIdentifier(platform::settingsAppRemainder), {});
    const auto record = provider.cachedWarrantyForSerialNumber(serialNumber);
    return record && !flawOfCachedRecord(provider, serialNumber) ? record : nullptr;
}

// The offer that the record makes for the device; null for none. Once it has ended, no rule tells from when it held.
std::optional<Offer> offerFor(const std::shared_ptr<VRXDevice>& device, const std::shared_ptr<VRXWarranty>& record) {
    const std::optional<Date> until = record->qxOfferEligibleUntil();
    if (!record->qxOfferDisplay() || !until) return std::nullopt;
    const auto info = VRXDeviceInfo::deviceInfoWithDevice(device, record);
    const PostDecision decision = decidePost(*info, {.outreachDelay = PostDateSettings::read().outreachDelay},
                                             platform::Platform::current().clock());
    return Offer{decision.dueDate ? std::optional(decision.dueDate->date) : dueDateInRecord(*record), *until};
}

// Takes down how the item looks from one moment to another.
void addLooks(std::vector<Shown>& looks, const FollowUpItem& item, Date from, Date until, Duration clockAhead,
              Duration day, const platform::Locale& locale) {
    while (from < until) {
        const host::ShownFollowUp shown = host::shownFollowUp(item, from + clockAhead + justAfter, day, locale);
        Date next = until;
        if (shown.nextTextChange && looks.size() < mostTexts)
            next = std::min(next, std::max(*shown.nextTextChange - clockAhead, from + justAfter));
        Shown look{.from = from,
                   .until = next,
                   .title = item.title.value_or(""),
                   .text = shown.text(item).value_or(""),
                   .action = item.actions.empty() ? "" : item.actions.front().label.value_or(""),
                   .hasBadge = shown.hasBadge,
                   .isExpired = shown.isExpired,
                   .daysLeft = shown.daysLeft};
        if (!looks.empty() && looks.back().until == from && looks.back().looksLike(look)) {
            looks.back().until = next;
            looks.back().daysLeft = look.daysLeft;
        } else {
            looks.push_back(std::move(look));
        }
        from = next;
    }
}

}  // namespace

Recorder::Recorder(sim::Host& host) : host_(host) {
    for (const std::string_view name : {"upgrade", "boot", "outreach", "followuppost", "followuprefresh"})
        activities_.push_back(
            {.identifier = platform::vendorIdentifier(platform::serviceNameRemainder).append(".").append(name)});
    host_.activities.setFiringObserver([this](const std::string& identifier) { noteFiring(identifier); });
    host_.followUps.setChangeObserver([this] { lookAtItems(); });
}

Recorder::~Recorder() {
    host_.activities.setFiringObserver(nullptr);
    host_.followUps.setChangeObserver(nullptr);
}

// A firing before the target date does nothing.
void Recorder::noteFiring(const std::string& identifier) {
    const auto target = host_.defaults.stored().find(identifier + ".TargetDate");
    const std::optional<Date> date = target == host_.defaults.stored().end() ? std::nullopt : target->second.asDate();
    if (date && *date > host_.clock.now()) return;
    auto lane = std::ranges::find(activities_, identifier, &ActivityLane::identifier);
    if (lane == activities_.end()) lane = activities_.insert(lane, {.identifier = identifier});
    lane->runs.push_back(moment());
    lastChange_ = moment();
    ++runCount_;
}

void Recorder::lookAtItems() {
    const std::vector<FollowUpItem>& items = host_.followUps.pending(followUpClientIdentifier());
    const Date now = moment();
    const auto isGone = [&](const Presence& presence) {
        return std::ranges::find(items, presence.item) == items.end();
    };
    for (Presence& presence : present_)
        if (isGone(presence)) {
            presence.until = now;
            past_.push_back(presence);
            lastChange_ = now;
        }
    std::erase_if(present_, isGone);
    for (const FollowUpItem& item : items) {
        if (std::ranges::find(present_, item, &Presence::item) != present_.end()) continue;
        present_.push_back({.item = item, .from = now, .clockAhead = host_.clock.now() - now});
        lastChange_ = now;
    }
}

DeviceLane& Recorder::laneOf(const std::string& serialNumber) {
    const auto lane = std::ranges::find(lanes_, serialNumber, &DeviceLane::serialNumber);
    return lane != lanes_.end() ? *lane : lanes_.emplace_back(DeviceLane{.serialNumber = serialNumber});
}

void Recorder::look() {
    lookAtItems();
    const Unnoticed scope(host_);
    const std::set<std::string> dismissed = serialNumberHashes(dismissedSerialNumberHashesKey);
    for (const auto& [serialNumber, device] : VRXDevicesManager::sharedManager()->allDevices()) {
        DeviceLane& lane = laneOf(serialNumber);
        lane.name = device->name();
        lane.kind = device->deviceTypeString();
        lane.isDismissed = dismissed.contains(platform::sha256Hash(serialNumber));
        if (const auto date = device->activationDate()) lane.activation = date;
        const auto record = countingRecord(serialNumber);
        lane.hasRecord = record != nullptr;
        if (!record) continue;
        lane.coverageEnd = record->coverageEndDate();
        const std::optional<Offer> offer = offerFor(device, record);
        if (offer && (lane.offers.empty() || lane.offers.back().until != offer->until)) lane.offers.push_back(*offer);
    }
}

Chronicle Recorder::chronicle() {
    look();
    const Unnoticed scope(host_);
    const Duration day = host::dayInterval(scope.settings());
    const Date end = moment();
    for (DeviceLane& lane : lanes_) lane.shown.clear();
    const auto add = [&](const Presence& presence) {
        const std::string* serialNumber = serialNumberOfItem(presence.item);
        std::vector<Shown>& looks = laneOf(serialNumber ? *serialNumber : "").shown;
        addLooks(looks, presence.item, presence.from, presence.until.value_or(end), presence.clockAhead, day,
                 host_.locale);
        if (!presence.until && !looks.empty() && looks.back().until == end) looks.back().until.reset();
    };
    std::ranges::for_each(past_, add);
    std::ranges::for_each(present_, add);
    // The item of the older layout can have gone in the moment in which it was seen.
    std::erase_if(lanes_, [](const DeviceLane& lane) { return lane.serialNumber.empty() && lane.shown.empty(); });
    return {.from = begin_, .until = end, .devices = lanes_, .activities = activities_};
}

}  // namespace vrx::timeline
