#include "vrxsim/rules.h"

#include <algorithm>
#include <cmath>
#include <cstdio>
#include <utility>

#include "vrx/platform/sha256_hash.h"
#include "vrx/platform/text.h"
#include "vrx/platform/vendor.h"

namespace vrx::simulation {

using platform::Date;
using platform::Duration;
using platform::FollowUpItem;

namespace {

constexpr double outreachDelayIfNoneIsSet = 2 * secondsOfDay;
constexpr double validityIfNoneIsSet = secondsOfDay;
constexpr Duration roundingOfDates{1.5};  // dates in texts are whole seconds
constexpr Duration beforeTheEnd{0.001};
constexpr const char* postedKey = "FollowupPostedSerialNumberHashes";
constexpr const char* dismissedKey = "FollowupDismissedSerialNumberHashes";

double settingOr(const World& world, std::string_view key, double otherwise) {
    const auto setting = world.host.defaults.stored().find(key);
    return setting == world.host.defaults.stored().end() ? otherwise : setting->second.asNumber().value_or(otherwise);
}

std::string textOr(const World& world, const std::string& key) {
    const auto setting = world.host.defaults.stored().find(key);
    const std::string* text = setting == world.host.defaults.stored().end() ? nullptr : setting->second.asString();
    return text ? *text : "";
}

// As the servers write dates: whole seconds.
std::optional<Date> sentDate(const std::optional<double>& day) {
    if (!day) return std::nullopt;
    return platform::dateFromEpoch(std::floor(platform::epochSeconds(World::dateOf(*day))));
}

// "2026-01-31 12:00:00 +0000"; null for any other text.
std::optional<Date> dateFrom(const std::string& text) {
    int year = 0, month = 0, day = 0, hour = 0, minute = 0, second = 0;
    if (std::sscanf(text.c_str(), "%d-%d-%d %d:%d:%d", &year, &month, &day, &hour, &minute, &second) != 6)
        return std::nullopt;
    const auto days = std::chrono::sys_days(std::chrono::year(year) / month / day).time_since_epoch().count();
    return platform::dateFromEpoch(static_cast<double>(days) * secondsOfDay + hour * secondsOfHour + minute * 60 +
                                   second);
}

const std::string* deviceIn(const FollowUpItem& item) {
    const auto entry = item.userInfo.find("FollowupSerialNumber");
    return entry == item.userInfo.end() ? nullptr : entry->second.asString();
}

std::string labelOf(const FollowUpItem& item) {
    return item.actions.size() == 1 ? item.actions[0].label.value_or("") : "";
}

std::string joined(const std::vector<int>& numbers) {
    std::string text;
    for (const int number : numbers) text += (text.empty() ? "" : " or ") + std::to_string(number);
    return text;
}

}  // namespace

Rules::Rules(World& world, Verdict& verdict) : world_(world), verdict_(verdict) {
    world_.host.log.listener = [this](const platform::LogEntry& line) { hear(line); };
    world_.host.followUps.listener = [this](const auto& answered) { hear(answered); };
}

void Rules::turnOff() {
    world_.host.log.listener = nullptr;
    world_.host.followUps.listener = nullptr;
}

void Rules::processEnds() {
    constexpr double longestStep = 60;
    if (world_.host.process.isRunning()) {
        processEndedAt_ = world_.elapsed();
        for (Plan* plan : {&postPlan_, &refreshPlan_})
            if (processEndedAt_ - plan->at < longestStep) plan->isCutShort = true;
        for (auto& [serialNumber, item] : items_)
            if (processEndedAt_ - item.filledAt < longestStep) item.isRunCutShort = true;
    }
    forgetWork();
}

// Nothing that was under way goes on.
void Rules::forgetWork() {
    work_.reset();
    toRemove_.clear();
    dismissals_.clear();
    outreach_.clear();
    outreachDevices_.clear();
    downloading_.clear();
    downloadingCount_ = 0;
    found_.clear();
    armed_ = Armed::Nothing;
    isMigrating_ = false;
}

void Rules::disagree(const std::string& text) {
    if (!disagreement_) disagreement_ = text;
}

void Rules::hear(const platform::LogEntry& line) {
    using Take = void (*)(Rules&, const std::vector<platform::LogArgument>&);
    static const std::map<std::string_view, Take> lines{
        {"launched", [](Rules& rules, const auto&) { rules.forgetWork(); }},
        {"activity for '%@' should occur on: %@", [](Rules& rules, const auto&) { rules.finishWork(); }},
        {"getting warranty using policy %@: %lu",
         [](Rules& rules, const auto& arguments) {
             rules.lookupBegins(arguments[0].text, std::strtoull(arguments[1].text.c_str(), nullptr, 10));
         }},
        {"no cached warranty : %@", [](Rules& rules, const auto&) { rules.cacheIsEmpty(); }},
        {"%s: shouldDownloadWarranty: %d",
         [](Rules& rules, const auto& arguments) { rules.lookupDecided(arguments[1].text == "1"); }},
        {"getWarrantyUsingPolicy completionBlock %{private}@ : %d",
         [](Rules& rules, const auto& arguments) { rules.lookupEnds(arguments[0].text, arguments[1].text == "1"); }},
        {"downloaded warranty: %@", [](Rules& rules, const auto& arguments) { rules.downloads(arguments[0].text); }},
        {"%s -> %@",
         [](Rules& rules, const auto& arguments) {
             if (arguments[0].text.starts_with("-[VRXFollowUpPost ")) rules.postBegins();
         }},
        {"getDefaultDeviceInfoUsingPolicy for device: '%@'",
         [](Rules& rules, const auto&) {
             rules.finishWork();
             rules.armed_ = Armed::Single;
         }},
        {"getDeviceInfoForSerialNumber for device: '%@'",
         [](Rules& rules, const auto&) {
             rules.finishWork();
             rules.armed_ = Armed::Single;
         }},
        {"getAllDeviceInfosUsingPolicy: '%@'",
         [](Rules& rules, const auto& arguments) { rules.listEnds(arguments[0].text); }},
        {"Devices followups to be posted, if required, after paired device change",
         [](Rules& rules, const auto&) { rules.pairingPlans(); }},
        {"%s: devices: %@",
         [](Rules& rules, const auto&) {
             rules.noteSupport();
             rules.outreach_.clear();
             rules.outreachDevices_.clear();
         }},
        {"serialNumber: %@ success: %d",
         [](Rules& rules, const auto& arguments) { rules.outreachLooks(arguments[0].text, arguments[1].text == "1"); }},
        {"Complete activity and schedule followUp post for: %@",
         [](Rules& rules, const auto&) { rules.outreachEnds(); }},
        {"No devices eligible for followUp posts", [](Rules& rules, const auto&) { rules.outreachEnds(); }},
        {"%s: Re-schedule followUp post for: %@",
         [](Rules& rules, const auto& arguments) { rules.postIsPlanned(arguments[1].text); }},
        {"Watch paired after phone's refreshActivity has already finished. Schedule followUp post for: %@",
         [](Rules& rules, const auto& arguments) { rules.postIsPlanned(arguments[0].text); }},
        {"Schedule next refresh for %@", [](Rules& rules, const auto&) { rules.refreshIsPlanned(false); }},
        {"%s: Schedule refresh for: %@", [](Rules& rules, const auto&) { rules.refreshIsPlanned(true); }},
        {"No followups present, don't schedule another refresh",
         [](Rules& rules, const auto&) { rules.refreshesEnd(); }},
        {"Migrating legacy followup..", [](Rules& rules, const auto&) { rules.isMigrating_ = true; }},
        {"Clearing legacy followup, no legacy warranty was found..",
         [](Rules& rules, const auto&) { rules.isMigrating_ = true; }},
    };
    const Armed armed = std::exchange(armed_, Armed::Nothing);  // only for what comes next
    const auto known = lines.find(line.format);
    if (known == lines.end()) return;
    beforeChange();
    if (armed == Armed::List && line.format == "%s -> %@") armed_ = armed;
    known->second(*this, line.arguments);
}

void Rules::hear(const sim::FollowUpControllers::Answered& answered) {
    using Request = sim::FollowUpControllers::Request;
    beforeChange();
    const Armed armed = std::exchange(armed_, Armed::Nothing);
    if (answered.request == Request::Post)
        posted(*answered.item, answered.isDone);
    else if (answered.request == Request::Clear)
        cleared(*answered.identifiers, answered.isDone);
    else if (armed != Armed::Nothing)
        refreshBegins(armed == Armed::List, answered.isDone);
}

// Lookups.

std::optional<std::string> Rules::cachedFile(const std::string& serialNumber) const {
    const std::string folder = world_.host.files.homeDirectory() + "/Library/Application Support/" +
                               platform::vendorIdentifier(".Vireo") + "/";
    return world_.host.files.content(folder + platform::sha256Hash(serialNumber) + "_Warranty.plist");
}

bool Rules::isCacheBehind(const std::string& serialNumber) const {
    const Download* const last = downloaded(serialNumber);
    const std::optional<std::string> file = cachedFile(serialNumber);
    return last && (!file || World::answerIn(*file) < last->answer);
}

bool Rules::isDismissalStored(const std::string& serialNumber) const {
    return isListed(dismissedKey, serialNumber);
}

Found Rules::cachedRecord(const std::string& serialNumber) const {
    const std::string hash = platform::sha256Hash(serialNumber);
    const std::optional<std::string> file = cachedFile(serialNumber);
    if (!file && downloaded(serialNumber)) return {0, Found::Lack::NotKept};
    if (!file || textOr(world_, hash + "_CachedWarrantyVersion") != "2") return {0, Found::Lack::NeverAnswered};
    if (textOr(world_, hash + "_CachedWarrantyLocale") != world_.host.locale.identifier)
        return {0, Found::Lack::OtherLanguage};
    if (!world_.host.accounts.primary) return {0, Found::Lack::SignedOut};
    return {World::answerIn(*file)};
}

void Rules::lookupBegins(const std::string& serialNumber, std::uint64_t policy) {
    finishWork();
    noteSupport();
    if (downloadingCount_ == 0 && lastLookupAt_ < world_.elapsed()) found_.clear();
    lastLookupAt_ = world_.elapsed();
    asked_ = {serialNumber, policy, cachedRecord(serialNumber), world_.host.files.isFailing()};
}

void Rules::cacheIsEmpty() {
    if (asked_.cached.isRecord() && !asked_.mayReadFail)
        disagree("the record of " + asked_.serialNumber + " is cached, and the agent has none");
    const bool isUnreadable = cachedFile(asked_.serialNumber).has_value();
    if (isUnreadable)
        asked_.cached = {0, Found::Lack::Unreadable};
    else if (asked_.cached.isRecord())
        asked_.cached = {0, Found::Lack::NeverAnswered};
}

void Rules::lookupDecided(bool isDownloading) {
    bool isExpected = asked_.policy == 2;
    if (asked_.policy == 0) {
        const auto stored = world_.host.defaults.stored().find(platform::sha256Hash(asked_.serialNumber) +
                                                               "_CachedWarrantyLastUpdatedDate");
        const std::optional<Date> at =
            stored == world_.host.defaults.stored().end() ? std::nullopt : stored->second.asDate();
        const Duration validity(settingOr(world_, "CachedWarrantyValidityDuration", validityIfNoneIsSet));
        isExpected = !asked_.cached.isRecord() || !at || *at + validity <= world_.host.clock.now();
    }
    if (isDownloading != isExpected)
        disagree("a lookup of " + asked_.serialNumber + " under policy " + std::to_string(asked_.policy) +
                 (isDownloading ? " downloads, though it should not" : " does not download"));
    asked_.isDownloading = isDownloading;
    if (!isDownloading) return;
    Downloads& downloads = downloading_[asked_.serialNumber];
    downloads.lookups.push_back(asked_);
    ++downloads.running;
    ++downloadingCount_;
}

// What a lookup replies whose download failed: under policy 0 the valid record in the cache.
Found Rules::failedLook(const Lookup& lookup) const {
    if (lookup.policy == 0 && lookup.cached.isRecord()) return lookup.cached;
    if (!world_.host.accounts.primary) return {0, Found::Lack::SignedOut};
    const bool isForLanguage = lookup.policy == 0 && lookup.cached.lack == Found::Lack::OtherLanguage;
    return {0, isForLanguage ? Found::Lack::OtherLanguage : Found::Lack::Failed};
}

void Rules::lookupEnds(const std::string& serialNumber, bool isDownloaded) {
    lastFound_.clear();
    lastLookupAt_ = world_.elapsed();
    lastSerialNumber_ = serialNumber;
    if (!asked_.isDownloading && asked_.serialNumber == serialNumber) {
        lastFound_ = {asked_.cached};
    } else if (Downloads& downloads = downloading_[serialNumber]; downloads.running > 0) {
        if (isDownloaded)
            lastFound_ = {{lastDownloaded_}};
        else
            for (const Lookup& lookup : downloads.lookups)
                if (const Found found = failedLook(lookup); std::ranges::find(lastFound_, found) == lastFound_.end())
                    lastFound_.push_back(found);
        --downloadingCount_;
        if (--downloads.running == 0) downloads.lookups.clear();
    }
    asked_ = {};
    std::vector<Found>& all = found_[serialNumber];
    for (const Found& found : lastFound_)
        if (std::ranges::find(all, found) == all.end()) all.push_back(found);
}

void Rules::downloads(const std::string& text) {
    lastDownloaded_ = World::answerIn(text);
    if (lastDownloaded_ > 0)
        downloaded_[world_.answer(lastDownloaded_).serialNumber] = {lastDownloaded_, world_.elapsed()};
}

// Takes the devices from the text, in their order: NAME (SERIAL NUMBER) (DATE) - TYPE: and so on.
void Rules::listEnds(const std::string& text) {
    finishWork();
    list_.clear();
    for (std::size_t between = text.find(") ("); between != std::string::npos;
         between = text.find(") (", between + 1)) {
        const std::size_t open = text.rfind('(', between);
        const std::string serialNumber = text.substr(open + 1, between - open - 1);
        const std::string date = text.substr(between + 3, text.find(')', between + 3) - between - 3);
        const auto found = found_.find(serialNumber);
        list_.push_back({serialNumber, dateFrom(date), found == found_.end() ? std::vector<Found>() : found->second});
    }
    armed_ = Armed::List;
    std::vector<std::string> listed;
    for (const Listed& device : list_) listed.push_back(device.serialNumber);
    noteLeftOut(listed);
}

// What keeps watches out of a list that is begun now.
void Rules::noteSupport() {
    const platform::Dictionary& settings = world_.host.defaults.stored();
    const auto cache = settings.find("ServerVersionCache");
    const platform::Value versions = cache == settings.end() ? platform::Value() : cache->second;
    const bool isVersionMissing = versions.asDictionary() && versions["LowServerVersion"].asInteger() != 3 &&
                                  versions["HighServerVersion"].asInteger() != 3;
    if (world_.host.flags.enabled.empty() || isVersionMissing) unsupportedAt_ = world_.elapsed();
}

bool Rules::wasUnsupported() const {
    constexpr double longestList = 1800;
    return unsupportedAt_ >= 0 && world_.elapsed() - unsupportedAt_ < longestList;
}

void Rules::noteLeftOut(const std::vector<std::string>& listed) {
    if (!wasUnsupported()) return;
    for (const platform::PairedWatch& watch : world_.host.watches.all)
        if (watch.serialNumber && std::ranges::find(listed, *watch.serialNumber) == listed.end())
            leftOut_[*watch.serialNumber] = world_.elapsed();
}

// Refreshes and posts.

std::optional<Removal::Cause> Rules::causeOfRemoval(const Found& found) const {
    using Cause = Removal::Cause;
    if (!found.isRecord()) return Cause::NoRecord;
    const Record& record = world_.answer(found.answer).record;
    if (!record.isOffered) return Cause::NoOffer;
    const std::optional<Date> until = sentDate(record.until);
    return until && *until > world_.host.clock.now() ? std::nullopt : std::optional(Cause::Ended);
}

void Rules::refreshBegins(bool isWhole, bool isListed) {
    endByLastRefresh_ = isListed ? EndOfRefreshes::None : EndOfRefreshes::FailedListing;
    if (!isListed) listingFailedAt_ = world_.elapsed();
    static const std::map<std::string, ShownItem> none;
    const std::map<std::string, ShownItem>& pending = isListed ? items_ : none;
    if (!isWhole) list_ = {{lastSerialNumber_, std::nullopt, lastFound_}};
    Work& work = work_.emplace();
    toRemove_.clear();
    std::set<std::string> listed;
    for (const Listed& device : list_) {
        listed.insert(device.serialNumber);
        const bool isShown = pending.contains(device.serialNumber);
        std::size_t removals = 0;
        Posting posting{device.serialNumber};
        for (const Found& found : device.found)
            if (const auto cause = causeOfRemoval(found)) {
                ++removals;
                toRemove_[device.serialNumber] = {world_.elapsed(), *cause, found, world_.clockOffset()};
            } else if (isShown) {
                posting.answers.push_back(found.answer);
            }
        if (removals > 0) work.mayClear.insert(identifierOf(device.serialNumber));
        if (removals > 0 && removals == device.found.size()) work.mustClear.insert(identifierOf(device.serialNumber));
        posting.isMust = removals == 0;
        if (!posting.answers.empty()) work.posts.push_back(std::move(posting));
    }
    if (!isWhole) return;
    for (const auto& [serialNumber, item] : pending) {
        if (listed.contains(serialNumber)) continue;
        const bool isThere = serialNumber == phone || world_.isPaired(serialNumber);
        toRemove_[serialNumber] = {
            world_.elapsed(), isThere && wasUnsupported() ? Removal::Cause::Unsupported : Removal::Cause::Unpaired};
        work.mayClear.insert(identifierOf(serialNumber));
        work.mustClear.insert(identifierOf(serialNumber));
    }
}

Duration Rules::outreachDelay() const {
    return Duration(settingOr(world_, "PostUpgradeOutreachDelay", outreachDelayIfNoneIsSet));
}

// Due before now and a while.
bool Rules::isDue(const Listed& device, const Found& found, Duration tolerance) const {
    if (causeOfRemoval(found) || isListed(dismissedKey, device.serialNumber)) return false;
    const Record& record = world_.answer(found.answer).record;
    Date due = record.shownFrom ? *sentDate(record.shownFrom)
                                : *sentDate(record.until) - Duration(record.daysBeforeEnd.value_or(0) * secondsOfDay);
    if (device.activation) due = std::max(due, *device.activation + outreachDelay());
    return due <= world_.host.clock.now() + tolerance;
}

bool Rules::isListed(const std::string& key, const std::string& serialNumber) const {
    const auto list = world_.host.defaults.stored().find(key);
    const platform::Array* hashes = list == world_.host.defaults.stored().end() ? nullptr : list->second.asArray();
    return hashes && std::ranges::find(*hashes, platform::Value(platform::sha256Hash(serialNumber))) != hashes->end();
}

PlannersView Rules::viewOf(const Listed& device, PlannersView::Run run) const {
    PlannersView view{.at = world_.elapsed(), .run = run};
    view.found = device.found.empty() ? Found{0, Found::Lack::NeverAnswered} : device.found.back();
    view.isDismissed = isListed(dismissedKey, device.serialNumber);
    view.wasPosted = isListed(postedKey, device.serialNumber);
    view.isDue = isDue(device, view.found, Duration(0));
    const std::optional<Date> named =
        view.found.isRecord() ? sentDate(world_.answer(view.found.answer).record.shownFrom) : std::nullopt;
    if (!named) return view;
    const Date due = device.activation ? std::max(*named, *device.activation + outreachDelay()) : *named;
    const std::optional<Date> next = nextPost(run == PlannersView::Run::Post, WithoutEnd::Counts);
    const std::optional<Date> otherwise = nextPost(run == PlannersView::Run::Post, WithoutEnd::IsLeftOut);
    view.isDateTakenAway = otherwise && *otherwise <= due && (!next || *next > due);
    return view;
}

// The date for which a run plans the next post: the earliest that lies ahead, where a date that is not there counts as
// now and can take that of another device away.
std::optional<Date> Rules::nextPost(bool areDueOnesPosted, WithoutEnd withoutEnd) const {
    const Date now = world_.host.clock.now();
    std::optional<Date> next;
    for (const Listed& device : list_) {
        if (device.found.empty() || !device.found.back().isRecord()) continue;
        const Record& record = world_.answer(device.found.back().answer).record;
        const bool isPostedNow = areDueOnesPosted && isDue(device, device.found.back(), Duration(0));
        if (!record.isOffered || isPostedNow || isListed(postedKey, device.serialNumber)) continue;
        const std::optional<Date> until = sentDate(record.until);
        if (!until && withoutEnd == WithoutEnd::IsLeftOut) continue;
        if (until && *until > now) {
            std::optional<Date> from = device.activation;
            if (from) *from += outreachDelay();
            if (const auto named = sentDate(record.shownFrom); named && *named >= from.value_or(now)) from = named;
            if (from && *from > now && (!next || *from < *next)) next = from;
        }
        if (until.value_or(now) < next.value_or(now)) next = until;
        if (next && *next < now) break;
    }
    return next;
}

void Rules::postIsPlanned(const std::string& date) {
    postPlan_ = {world_.elapsed()};
    const bool isCertain = std::ranges::all_of(list_, [](const Listed& device) { return device.found.size() == 1; });
    const std::optional<Date> expected = nextPost(false, WithoutEnd::Counts), planned = dateFrom(date);
    const bool isAsExpected = expected && planned && std::abs((*expected - *planned).count()) < roundingOfDates.count();
    if (isCertain && !isAsExpected)
        disagree("the next post is planned for " + date + " instead of " + platform::describe(expected));
}

void Rules::postBegins() {
    if (std::exchange(armed_, Armed::Nothing) != Armed::List) return;
    Work& work = work_.emplace();
    for (const Listed& device : list_) {
        planned_[device.serialNumber] = viewOf(device, PlannersView::Run::Post);
        Posting posting{device.serialNumber};
        posting.isMust = true;
        for (const Found& found : device.found) {
            if (isDue(device, found, roundingOfDates)) posting.answers.push_back(found.answer);
            posting.isMust = posting.isMust && isDue(device, found, -roundingOfDates);
        }
        if (!posting.answers.empty()) work.posts.push_back(std::move(posting));
    }
}

void Rules::pairingPlans() {
    finishWork();
    lastPairingPlansAt_ = world_.elapsed();
    postPlan_ = {world_.elapsed()};
    for (const Listed& device : list_) planned_[device.serialNumber] = viewOf(device, PlannersView::Run::Pairing);
}

void Rules::outreachLooks(const std::string& serialNumber, bool isDownloaded) {
    const Found found = isDownloaded ? Found{lastDownloaded_} : failedLook({serialNumber, 2});
    PlannersView view{.at = world_.elapsed(), .run = PlannersView::Run::Outreach, .found = found};
    view.isExcluded = found.isRecord() && world_.hasCarrier(world_.answer(found.answer).record.excludedCarrier);
    outreach_.push_back(view);
    outreachDevices_.push_back(serialNumber);
}

void Rules::outreachEnds() {
    for (std::size_t i = 0; i < outreach_.size(); ++i) planned_[outreachDevices_[i]] = outreach_[i];
    lastOutreachAt_ = world_.elapsed();
    postPlan_ = {world_.elapsed()};
    noteLeftOut(outreachDevices_);
}

void Rules::refreshIsPlanned(bool isForAll) {
    endOfRefreshes_ = EndOfRefreshes::None;
    refreshPlan_ = {world_.elapsed()};
    for (const Listed& device : list_) {
        if (device.found.empty() || !(isForAll || items_.contains(device.serialNumber))) continue;
        RefreshView& view = refreshed_[device.serialNumber];
        view = {.at = world_.elapsed(), .found = device.found.back()};
        if (causeOfRemoval(view.found)) continue;
        const Record& record = world_.answer(view.found.answer).record;
        const Date now = world_.host.clock.now();
        view.daysLeft = (*sentDate(record.until) - now).count() / settingOr(world_, "OneDayInterval", secondsOfDay);
        view.isDisplayAhead = (record.shownFrom && *sentDate(record.shownFrom) > now) ||
                              (device.activation && *device.activation + outreachDelay() > now);
        view.hasNoActivation = !device.activation;
    }
}

// Items.

const std::string& Rules::identifierOf(const std::string& serialNumber) {
    std::string& identifier = identifiers_[serialNumber];
    if (identifier.empty()) identifier = platform::vendorIdentifier(".Vireo.") + platform::sha256Hash(serialNumber);
    return identifier;
}

std::string Rules::deviceOf(const std::string& identifier) const {
    const auto found = std::ranges::find(identifiers_, identifier, &std::pair<const std::string, std::string>::second);
    return found == identifiers_.end() ? "" : found->first;
}

// Empty when the item is filled from the answer.
std::string Rules::differenceFrom(const FollowUpItem& item, int number) const {
    const Answer& answer = world_.answer(number);
    const std::optional<Date> until = sentDate(answer.record.until);
    const double oneDay = settingOr(world_, "OneDayInterval", secondsOfDay);
    const double days =
        until ? std::max(std::ceil((*until - world_.host.clock.now()).count() / (oneDay > 0 ? oneDay : secondsOfDay)),
                         0.0)
              : 0;
    if (labelOf(item) != World::label(number))
        return "has the texts of '" + labelOf(item) + "' instead of those of answer " + std::to_string(number);
    if (item.title != World::title(answer.language)) return "has a title that the server did not send";
    if (item.expirationDate != (until ? std::optional(*until - beforeTheEnd) : std::nullopt))
        return "expires at another time than the offer's end";
    if (numberIn(item.informativeFooterText.value_or("")) != std::max(static_cast<int>(days), 1))
        return "says '" + item.informativeFooterText.value_or("") + "' " + std::to_string(static_cast<int>(days)) +
               " days before the offer's end";
    return "";
}

void Rules::posted(const FollowUpItem& item, bool isDone) {
    const std::string* serialNumber = deviceIn(item);
    const int answer = World::answerIn(labelOf(item));
    if (!serialNumber || item.uniqueIdentifier != identifierOf(*serialNumber))
        return disagree("an item is posted under an identifier that is not its device's");
    std::vector<int> allowed;
    if (isMigrating_) {
        allowed = {answer};
    } else if (work_) {
        const auto posting = std::ranges::find(work_->posts, *serialNumber, &Posting::serialNumber);
        if (posting != work_->posts.end()) allowed = posting->answers;
        if (posting != work_->posts.end()) work_->posts.erase(posting);
    }
    if (allowed.empty()) return disagree("the item of " + *serialNumber + " is posted without a reason");
    const bool isFilled =
        std::ranges::any_of(allowed, [&](int number) { return differenceFrom(item, number).empty(); });
    if (!isFilled)
        disagree("the item of " + *serialNumber + " " + differenceFrom(item, allowed.back()) + " (of " +
                 joined(allowed) + ")");
    const auto shown = items_.find(*serialNumber);
    const bool isFromOlderLayout = isMigrating_ || (shown != items_.end() && shown->second.isFromOlderLayout);
    if (isDone) {
        items_[*serialNumber] = {answer, world_.elapsed(), item.title.value_or(""),
                                 item.informativeFooterText.value_or(""), isFromOlderLayout};
        removals_.erase(*serialNumber);
    } else if (shown != items_.end()) {
        shown->second.hasRequestFailed = true;
    } else if (const auto view = planned_.find(*serialNumber); view != planned_.end()) {
        view->second.wasRefused = true;
    }
}

void Rules::cleared(const std::vector<std::string>& identifiers, bool isDone) {
    if (isMigrating_ && identifiers.size() == 1 && identifiers[0] == platform::vendorIdentifier(".Vireo")) {
        isMigrating_ = false;
        return;
    }
    const std::set<std::string> all(identifiers.begin(), identifiers.end());
    if (work_ && !work_->mayClear.empty() && std::ranges::includes(work_->mayClear, all) &&
        std::ranges::includes(all, work_->mustClear)) {
        work_->mayClear.clear();
        work_->mustClear.clear();
        if (!isDone && endByLastRefresh_ == EndOfRefreshes::None) endByLastRefresh_ = EndOfRefreshes::RefusedClear;
        for (const auto& [serialNumber, removal] : std::exchange(toRemove_, {})) {
            const auto shown = items_.find(serialNumber);
            if (shown == items_.end() || !all.contains(identifierOf(serialNumber))) continue;
            shown->second.hasRequestFailed = !isDone;
            if (!isDone) continue;
            items_.erase(shown);
            removals_[serialNumber] = removal;
        }
        return;
    }
    finishWork();
    const std::string serialNumber = identifiers.size() == 1 ? deviceOf(identifiers[0]) : "";
    const auto asked = std::ranges::find_if(dismissals_, [&](const auto& entry) {
        return entry.second > 0 && identifiers.size() == 1 && identifierOf(entry.first) == identifiers[0];
    });
    if (asked == dismissals_.end())
        return disagree("items are cleared without a reason" + (serialNumber.empty() ? "" : ": " + serialNumber));
    --asked->second;
    if (isDone && items_.erase(asked->first) > 0)
        removals_[asked->first] = {world_.elapsed(), Removal::Cause::Dismissed};
}

// A piece of work that has ended has done all that it must.
void Rules::finishWork() {
    if (!work_) return;
    if (!work_->mustClear.empty())
        disagree("the item of " + deviceOf(*work_->mustClear.begin()) + " is not cleared by a refresh");
    for (const Posting& posting : work_->posts)
        if (posting.isMust) disagree("the item of " + posting.serialNumber + " is neither posted nor updated");
    work_.reset();
}

void Rules::check() {
    finishWork();
    std::size_t count = 0;
    for (const FollowUpItem& item : world_.items()) {
        const std::string* serialNumber = deviceIn(item);
        if (!serialNumber) continue;
        ++count;
        const auto shown = items_.find(*serialNumber);
        if (shown == items_.end())
            disagree("the item of " + *serialNumber + " is there, which the rules do not give");
        else if (shown->second.title != item.title.value_or("") ||
                 shown->second.footer != item.informativeFooterText.value_or("") ||
                 World::label(shown->second.answer) != labelOf(item))
            disagree("the item of " + *serialNumber + " has other texts than it was filled with");
    }
    if (count != items_.size()) disagree("not every item is there that the rules give");
    if (disagreement_) verdict_.report(world_.elapsed() / secondsOfDay, "as-the-rules", *disagreement_);
}

std::optional<Date> Rules::activation(const std::string& serialNumber) const {
    if (serialNumber == phone) {
        const auto stored = world_.host.defaults.stored().find("DefaultDeviceActivationDate");
        return stored == world_.host.defaults.stored().end() ? std::nullopt : stored->second.asDate();
    }
    const auto watch = std::ranges::find(world_.host.watches.all, serialNumber,
                                         [](const auto& paired) { return paired.serialNumber.value_or(""); });
    return watch == world_.host.watches.all.end() ? std::nullopt : watch->pairedDate;
}

// Arabic, Persian and Hindi write other digits; they follow one another in UTF-8 as they do everywhere.
int Rules::numberIn(std::string_view text) {
    constexpr std::string_view zeros[] = {"0", "\u0660", "\u06f0", "\u0966"};
    int number = 0;
    for (std::size_t position = 0; position < text.size(); ++position)
        for (const std::string_view zero : zeros) {
            const std::string_view digit = text.substr(position, zero.size());
            if (digit.size() != zero.size() || digit.substr(0, zero.size() - 1) != zero.substr(0, zero.size() - 1))
                continue;
            const int value = static_cast<unsigned char>(digit.back()) - static_cast<unsigned char>(zero.back());
            if (value >= 0 && value <= 9) number = 10 * number + value;
        }
    return number;
}

}  // namespace vrx::simulation
