#include "vrxsim/invariants.h"

#include <algorithm>
#include <utility>

#include "vrx/platform/sha256_hash.h"
#include "vrx/platform/vendor.h"

namespace vrx::simulation {

using platform::Date;
using platform::Duration;
using platform::FollowUpItem;

namespace {

constexpr std::string_view targetDateSuffix = ".TargetDate";
constexpr int quartersOfAnHour = 96;  // in a day
// One in each, and a first one by each other activity.
constexpr int mostRunsOfOneDay = quartersOfAnHour + 4;
// The machine may be off, or in trouble, for half of a day.
constexpr int leastRunsOfRestlessDay = quartersOfAnHour / 2;
// A chain of activities that follow from one cause, each of which may be deferred now and then.
constexpr int mostRunsOfOneCause = 4;

const std::string* serialNumberOf(const FollowUpItem& item) {
    const auto entry = item.userInfo.find("FollowupSerialNumber");
    return entry == item.userInfo.end() ? nullptr : entry->second.asString();
}

std::vector<std::string> words(const std::string& text) {
    std::vector<std::string> result;
    std::size_t begin = 0;
    for (std::size_t end; (end = text.find(' ', begin)) != std::string::npos; begin = end + 1)
        result.push_back(text.substr(begin, end - begin));
    result.push_back(text.substr(begin));
    return result;
}

}  // namespace

void Invariants::report(const char* rule, std::string detail) {
    verdict_.report(world_.elapsed() / secondsOfDay, rule, std::move(detail));
}

void Invariants::processStarted() {
    calmSince_ = world_.elapsed();
    ++admitted_[static_cast<std::int64_t>(world_.elapsed() / secondsOfDay)];
}

void Invariants::processWasCutShort() {
    mayDatesBeStray_ = mayDatesBeOff_ = true;
}

void Invariants::check() {
    noteTrouble();
    checkItems();
    checkShownItems();
    checkToldItems();
    checkDismissals();
    checkFiles();
    checkTargetDates();
    checkRuns();
    checkGrowth();
    wasFailing_ = world_.isFailing();
}

void Invariants::noteTrouble() {
    const double now = world_.elapsed();
    calmSince_ = world_.isTroubled() || wasFailing_ ? now : std::max(calmSince_, world_.machineChangedAt);
    const bool areFilesFailing = world_.host.files.isFailing();
    if (std::exchange(wereFilesFailing_, areFilesFailing) || areFilesFailing) filesCalmSince_ = now;
    if (wasFailing_) mayDatesBeStray_ = true;
    if (world_.hasFailed) mayDatesBeOff_ = true;
    int& admitted = admitted_[static_cast<std::int64_t>(now / secondsOfDay)];
    if (world_.clockSetAt > lastClockSet_) {
        lastClockSet_ = world_.clockSetAt;
        calmSince_ = now;
        mayDatesBeStray_ = mayDatesBeOff_ = true;
        ++admitted;
    }
    admitted += clients_.outreaches() - std::exchange(outreaches_, clients_.outreaches());
    if (std::exchange(pairedDevicesChangedAt_, world_.pairedDevicesChangedAt) != world_.pairedDevicesChangedAt)
        ++admitted;
}

// Under each identifier and for each device there is at most one item. Only the older layout's item may, after a kill,
// stand beside the one that it became.
void Invariants::checkItems() {
    std::set<std::string> identifiers, devices;
    const std::string olderLayouts = platform::vendorIdentifier(".Vireo");
    for (const FollowUpItem& item : world_.items()) {
        if (!identifiers.insert(item.uniqueIdentifier).second)
            report("one-item", "two items have the identifier " + item.uniqueIdentifier);
        const std::string* serialNumber = serialNumberOf(item);
        if (!serialNumber || item.uniqueIdentifier == olderLayouts) continue;
        if (!devices.insert(*serialNumber).second) report("one-item", "there are two items for " + *serialNumber);
    }
}

// The follow-up service shows what it acknowledged.
void Invariants::checkShownItems() {
    for (const std::string& asked : world_.host.followUps.asked()) {
        const std::vector<std::string> request = words(asked);
        for (std::size_t i = 1; i < request.size(); ++i) {
            const auto shown = std::ranges::find(shown_, request[i]);
            if (request[0] == "post" && shown == shown_.end()) shown_.push_back(request[i]);
            if (request[0] == "clear" && shown != shown_.end()) shown_.erase(shown);
        }
    }
    std::vector<std::string> present;
    for (const FollowUpItem& item : world_.items()) present.push_back(item.uniqueIdentifier);
    const bool isAsAcknowledged =
        present == shown_ || wasFailing_ || world_.isFailing() || (world_.hadOldLayout && world_.elapsed() < 1);
    shown_ = present;
    if (!isAsAcknowledged) report("acknowledged", "the items differ from those that were posted and not cleared");
}

// The items follow what the agent is told of: unpairings, and changes of the language. A process that was started in
// the very moment may have replaced the one that was told.
void Invariants::checkToldItems() {
    for (const FollowUpItem& item : world_.items()) {
        const std::string* serialNumber = serialNumberOf(item);
        const auto unpaired = serialNumber ? world_.unpairedAt.find(*serialNumber) : world_.unpairedAt.end();
        if (unpaired != world_.unpairedAt.end() && world_.elapsed() - unpaired->second > secondsOfHour &&
            calmSince_ < unpaired->second && !world_.hasTestSettings)
            report("told", "the item of " + *serialNumber + " outlasts its unpairing");
        const double changed = world_.languageChangedAt;
        if (changed > 0 && world_.elapsed() - changed > secondsOfHour && calmSince_ < changed &&
            filesCalmSince_ <= changed && world_.isServerFineSince(changed) && item.title &&
            *item.title != World::title(world_.host.locale.identifier))
            report("told", "the item '" + *item.title + "' outlasts a change of the language");
    }
}

// A dismissal whose clear and write succeeded holds until a tester takes it back.
void Invariants::checkDismissals() {
    const platform::Dictionary& settings = world_.host.defaults.stored();
    const auto list = settings.find("FollowupDismissedSerialNumberHashes");
    const platform::Array* hashes = list == settings.end() ? nullptr : list->second.asArray();
    for (const std::string& serialNumber : clients_.dismissed()) {
        const std::string hash = platform::sha256Hash(serialNumber);
        if (!hashes || std::ranges::find(*hashes, platform::Value(hash)) == hashes->end())
            report("dismissed", "the dismissal of " + serialNumber + " is not remembered");
        const std::string identifier = platform::vendorIdentifier(".Vireo.") + hash;
        if (std::ranges::find(world_.items(), identifier, &FollowUpItem::uniqueIdentifier) != world_.items().end())
            report("dismissed", "the item of " + serialNumber + " is there, which was dismissed");
    }
}

void Invariants::checkFiles() {
    for (const std::string& path : world_.host.files.written()) {
        const std::optional<std::string> content = world_.host.files.content(path);
        if (!content) continue;
        const platform::Data data(content->begin(), content->end());
        if (!world_.host.propertyList.parse(data)) report("whole-file", "the file " + path + " is not whole");
    }
}

void Invariants::checkTargetDates() {
    for (const auto& firing : world_.host.activities.firings()) overdue_.erase(firing.identifier);
    std::erase_if(overdue_, [this](const auto& entry) {
        return !world_.host.defaults.stored().contains(entry.first + std::string(targetDateSuffix));
    });
    for (const auto& [key, value] : world_.host.defaults.stored())
        if (key.ends_with(targetDateSuffix) && value.asDate())
            checkTargetDate(key.substr(0, key.size() - targetDateSuffix.size()), *value.asDate());
    mayDatesBeStray_ = false;
}

// A target date ahead has a registration, which fires soon after it. One that has passed leads to a run, which takes it
// away.
void Invariants::checkTargetDate(const std::string& activity, Date date) {
    const Duration ahead = date - world_.host.clock.now();
    const std::optional<Duration> left = world_.host.activities.timeLeft(activity);
    const auto excuse = excused_.find(activity);
    const bool isExcused = excuse != excused_.end() && excuse->second == date;
    if (ahead > Duration(0)) {
        overdue_.erase(activity);
        if (!left && mayDatesBeStray_)
            excused_[activity] = date;
        else if (!left && !isExcused)
            report("will-fire", activity + " has a target date ahead, and nothing will fire it");
        else if (left && *left > ahead + Duration(secondsOfHour + 60) && !mayDatesBeOff_)
            report("will-fire", activity + " will fire " + std::to_string((*left - ahead).count()) + " s too late");
        return;
    }
    Overdue& overdue = overdue_.try_emplace(activity, Overdue{date, world_.elapsed()}).first->second;
    if (overdue.date != date || isExcused) overdue = {date, world_.elapsed()};
    const bool isLong = world_.elapsed() - overdue.since > 2 * secondsOfHour;
    if (isLong && isCalmSince(overdue.since) && !mayDatesBeOff_)
        report("fires", activity + " has not run, though its target date has passed");
}

void Invariants::checkRuns() {
    const auto today = static_cast<std::int64_t>(world_.elapsed() / secondsOfDay);
    for (const auto& firing : world_.host.activities.firings()) {
        const double firedAt = world_.host.clock.elapsedAt(firing.date).count();
        ++runs_[firing.identifier][static_cast<std::int64_t>(firedAt / secondsOfDay)];
        ++unfiredRuns_[firing.identifier];
    }
    for (const platform::LogEntry& line : world_.host.log.entries()) {
        if (line.format == "target not past for '%@', defer for: %.02f" && !mayDatesBeOff_)
            report("not-early", line.arguments[0].text + " fired before its target date");
        if (line.format == "target reached for '%@', trigger activity" && --unfiredRuns_[line.arguments[0].text] < 0)
            report("one-run", line.arguments[0].text + " ran without a firing");
    }
    for (auto& [activity, days] : runs_) {
        for (const auto& [day, runs] : days) {
            if (runs > mostRunsOfOneDay + mostRunsOfOneCause * (admitted_[day] + admitted_[day - 1]))
                report("few-runs", activity + " ran " + std::to_string(runs) + " times on day " + std::to_string(day));
            if (day < today && runs >= leastRunsOfRestlessDay) ++restlessDays_[activity];
        }
        std::erase_if(days, [&](const auto& entry) { return entry.first < today; });
    }
    std::erase_if(admitted_, [&](const auto& entry) { return entry.first < today - 2; });
}

// Nothing grows but the two lists of hashes, and what is kept of each serial number.
void Invariants::checkGrowth() {
    constexpr std::size_t settingsBesides = 40, filesBesides = 4, mostPending = 1000;
    const std::size_t devices = world_.everKnown.size() + 3;  // strangers that were asked for, test watches
    if (world_.host.defaults.stored().size() > settingsBesides + 3 * devices)
        report("no-growth", "there are " + std::to_string(world_.host.defaults.stored().size()) + " settings");
    if (world_.host.files.paths().size() > filesBesides + 2 * devices)
        report("no-growth", "there are " + std::to_string(world_.host.files.paths().size()) + " files");
    if (world_.host.queues.pendingCount() > mostPending)
        report("no-growth", std::to_string(world_.host.queues.pendingCount()) + " tasks wait for their turn");
}

}  // namespace vrx::simulation
