#include "vrxsim/world.h"

#include <algorithm>
#include <cerrno>
#include <charconv>

#include "vrx/platform/vendor.h"

namespace vrx::simulation {

using platform::Array;
using platform::Date;
using platform::Dictionary;
using platform::Duration;
using platform::Value;
using sim::HttpAnswer;

namespace {

const std::string coverageUrl = "https://coverage.orvane.example/api/v2/coverage/summary";
const std::string versionsUrl = "https://configuration.orvane.example/library/ORVANE/asset/vrxV2.plist";
constexpr std::string_view dismissals = "FollowupDismissedSerialNumberHashes";

std::optional<double> maybe(const std::string& word) {
    return word == "-" ? std::nullopt : std::optional(numberFrom(word));
}

std::int64_t whole(double number) {
    return static_cast<std::int64_t>(number);
}

std::string propertyList(const Value& root) {
    const auto data = platform::Platform::current().propertyList().serialize(root, platform::PropertyListFormat::Xml);
    return {data->begin(), data->end()};
}

}  // namespace

World::World() {
    host.device.strings["SerialNumber"] = phone;
    host.flags.enabled = {{"Vireo", "Meridian_3_0"}};
    host.accounts.tokens[platform::vendorIdentifier(".ks.supportapp.auth")] = "token";
    host.accounts.renewedToken = "renewed";
    host.http.answer(coverageUrl, [this](const platform::HttpRequest& request) { return answer(request); });
    host.http.answer(versionsUrl, [this](const platform::HttpRequest& request) { return versionsAnswer(request); });
}

std::vector<platform::FollowUpItem>& World::items() {
    return host.followUps.pending(platform::vendorIdentifier(".Vireo"));
}

bool World::isPaired(const std::string& serialNumber) const {
    return std::ranges::any_of(host.watches.all, [&](const auto& watch) { return watch.serialNumber == serialNumber; });
}

std::optional<Date> World::latestEnd(const std::string& serialNumber) const {
    const auto end = latestEnds_.find(serialNumber);
    return end == latestEnds_.end() ? std::nullopt : std::optional(dateOf(end->second));
}

const Record* World::record(const std::string& serialNumber) const {
    const auto record = records_.find(serialNumber);
    return record == records_.end() ? nullptr : &record->second;
}

int World::answerIn(std::string_view text) {
    constexpr std::string_view before = "Answer ";
    const std::size_t found = text.find(before);
    int number = 0;
    if (found != std::string_view::npos)
        std::from_chars(text.data() + found + before.size(), text.data() + text.size(), number);
    return number;
}

bool World::hasCarrier(const std::string& code) const {
    return std::ranges::any_of(host.telephony.carriers, [&](const auto& entry) {
        return entry.second.mobileCountryCode.value_or("") + entry.second.mobileNetworkCode.value_or("") == code;
    });
}

bool World::areWatchesSupported() const {
    constexpr std::int64_t needed = 3;
    return !host.flags.enabled.empty() && (lowVersion_ == needed || highVersion_ == needed);
}

bool World::isFailing() const {
    using Request = sim::FollowUpControllers::Request;
    return host.defaults.failingWrites() > 0 ||
           std::ranges::any_of(std::array{Request::Post, Request::Clear, Request::List},
                               [&](Request request) { return host.followUps.isFailing(request); });
}

bool World::isTroubled() const {
    return !isNetworkOn_ || isMetered_ || isDeferring_ || isFailing() || !host.process.isRunning();
}

bool World::isServerFine() const {
    return outage_.empty() && serverTroubles_.empty() && versionTroubles_.empty() && lowVersion_ == 2 &&
           highVersion_ == 3 && host.accounts.primary && host.accounts.renewalResult.code == 0;
}

bool World::happen(const Event& event) {
    return changeDevice(event) || changeMachine(event) || changeServers(event);
}

bool World::changeDevice(const Event& event) {
    const auto& [second, verb, words] = event;
    if (verb == "pair") {
        pair(words[0], words[1]);
    } else if (verb == "unpair") {
        unpair(words[0]);
    } else if (verb == "language") {
        if (host.locale.identifier != words[0]) languageChangedAt = elapsed();
        host.locale.identifier = words[0];
        host.tellChanges();
    } else if (verb == "zone") {
        host.clock.setTimeZoneOffset(std::chrono::seconds(whole(numberFrom(words[0]))));
    } else if (verb == "carrier") {
        host.telephony.carriers.clear();
        if (words[0].size() >= 5)
            host.telephony.carriers["sim"] = {.mobileCountryCode = words[0].substr(0, 3),
                                              .mobileNetworkCode = words[0].substr(3)};
    } else if (verb == "flag") {
        host.flags.enabled.clear();
        if (words[0] == "on") host.flags.enabled = {{"Vireo", "Meridian_3_0"}};
    } else if (verb == "internal") {
        host.device.isInternal = words[0] == "on";
    } else if (verb == "number") {
        setSetting(words[0], numberFrom(words[1]));
    } else if (verb == "text") {
        setSetting(words[0], words[1]);
    } else if (verb == "pairs") {
        setSetting(words[0], Dictionary{{words[1], words[2]}});
    } else if (verb == "forget") {
        setSetting(words[0], nullptr);
    } else if (verb == "take-back") {
        host.defaults.set(dismissals, nullptr);
    } else {
        return false;
    }
    return true;
}

bool World::changeMachine(const Event& event) {
    const auto& [second, verb, words] = event;
    if (verb == "network") {
        isNetworkOn_ = words[0] == "on";
        host.activities.setNetworkAvailable(isNetworkOn_);
        host.http.setNetworkAvailable(isNetworkOn_);
    } else if (verb == "metered") {
        isMetered_ = words[0] == "on";
        host.activities.setNetworkMetered(isMetered_);
    } else if (verb == "deferral") {
        isDeferring_ = words[0] == "on";
        host.activities.setShouldDefer(isDeferring_);
    } else if (verb == "clock") {
        setClock(numberFrom(words[0]));
    } else if (verb == "fail") {
        fail(words[0], static_cast<int>(numberFrom(words[1])));
    } else if (verb == "power-cut-in-write") {
        host.files.crashNextReplace();
    } else if (verb == "old-layout") {
        makeOldLayout(numberFrom(words[0]));
    } else {
        return false;
    }
    machineChangedAt = elapsed();
    return true;
}

bool World::changeServers(const Event& event) {
    const auto& [second, verb, words] = event;
    if (verb == "record") {
        setRecord(words);
    } else if (verb == "no-record") {
        if (const auto record = records_.find(words[0]); record != records_.end()) {
            Record withoutOffer = record->second;
            withoutOffer.isOffered = false;
            takeRecord(words[0], withoutOffer);
        }
    } else if (verb == "account") {
        host.accounts.primary =
            words[0] == "in" ? std::optional(platform::CloudAccount{"user@cloud", "ALT-1"}) : std::nullopt;
    } else if (verb == "versions") {
        lowVersion_ = whole(numberFrom(words[0]));
        highVersion_ = whole(numberFrom(words[1]));
    } else if (verb == "server" || verb == "versions-server") {
        std::deque<std::string>& troubles = verb == "server" ? serverTroubles_ : versionTroubles_;
        troubles.assign(static_cast<std::size_t>(numberFrom(words[1])), words[0]);
    } else if (verb == "outage") {
        outage_ = words[0] == "over" ? "" : words[0];
    } else if (verb == "renewal") {
        host.accounts.renewalResult.code = words[0] == "fails" ? 1 : 0;
        host.accounts.renewalDelay = Duration(numberFrom(words[1]));
    } else {
        return false;
    }
    serverTroubledAt_ = elapsed();
    return true;
}

void World::setRecord(const std::vector<std::string>& words) {
    takeRecord(words[0], {.shownFrom = maybe(words[1]),
                          .until = maybe(words[2]),
                          .daysBeforeEnd = maybe(words[3]),
                          .isOffered = numberFrom(words[4]) != 0,
                          .excludedCarrier = words[5]});
}

void World::takeRecord(const std::string& serialNumber, Record record) {
    Record& present = records_[serialNumber];
    if (!present.saysTheSameAs(record)) {
        record.version = ++lastVersion_;
        record.changedAt = elapsed();
        present = record;
    }
    everKnown.insert(serialNumber);
    if (!record.until) return;
    const auto latest = latestEnds_.try_emplace(serialNumber, *record.until).first;
    latest->second = std::max(latest->second, *record.until);
}

void World::pair(const std::string& serialNumber, const std::string& dayWord) {
    if (isPaired(serialNumber)) return;
    const std::optional<double> since = maybe(dayWord);
    host.watches.all.push_back({.name = serialNumber,
                                .localizedModelName = std::nullopt,
                                .serialNumber = serialNumber,
                                .pairedDate = since ? std::optional(dateOf(*since)) : std::nullopt,
                                .isPaired = true});
    unpairedAt.erase(serialNumber);
    pairedAt[serialNumber] = elapsed();
    everKnown.insert(serialNumber);
    pairedDevicesChangedAt = elapsed();
    host.tellChanges();
}

void World::unpair(const std::string& serialNumber) {
    if (!isPaired(serialNumber)) return;
    std::erase_if(host.watches.all, [&](const auto& watch) { return watch.serialNumber == serialNumber; });
    unpairedAt[serialNumber] = elapsed();
    pairedAt.erase(serialNumber);
    pairedDevicesChangedAt = elapsed();
    host.tellChanges();
}

void World::setClock(double seconds) {
    host.clock.set(host.clock.now() + Duration(seconds));
    host.activities.wallClockWasSet();
    clockSetAt = elapsed();
}

void World::setSetting(const std::string& key, Value value) {
    host.defaults.set(key, std::move(value));
    hasTestSettings = true;
}

void World::fail(const std::string& what, int count) {
    using Files = sim::Files;
    using Request = sim::FollowUpControllers::Request;
    ++failures;
    if (what == "settings") {
        host.defaults.failWrites(count);
        hasFailed = true;
    } else if (what == "post" || what == "clear" || what == "list") {
        host.followUps.fail(what == "post" ? Request::Post : what == "clear" ? Request::Clear : Request::List, count);
    } else {
        const auto operation = what == "read"      ? Files::Operation::Read
                               : what == "replace" ? Files::Operation::Replace
                               : what == "folder"  ? Files::Operation::CreateDirectories
                                                   : Files::Operation::Remove;
        host.files.fail(operation, what == "replace" ? ENOSPC : EIO, count);
    }
}

// One record and one follow-up, and neither names a device.
void World::makeOldLayout(double until) {
    const Record record{.until = until, .isOffered = true, .excludedCarrier = "-"};
    latestEnds_.try_emplace(phone, until).first->second = std::max(until, latestEnds_[phone]);
    if (!records_.contains(phone)) takeRecord(phone, record);
    host.files.put(host.files.homeDirectory() + "/Library/Application Support/" + platform::vendorIdentifier(".Vireo") +
                       "/Warranty.plist",
                   propertyList(coverage(phone, record, host.locale.identifier)));
    host.defaults.set("CachedWarrantyLastUpdatedDate", host.clock.now());
    host.defaults.set("CachedWarrantyLocale", host.locale.identifier);
    host.defaults.set("CachedWarrantyVersion", "2");
    items().push_back({.uniqueIdentifier = platform::vendorIdentifier(".Vireo")});
    hadOldLayout = true;
}

Dictionary World::coverage(const std::string& serialNumber, const Record& record, const std::string& language) {
    answers_.push_back({serialNumber, record, language});
    Dictionary toggles{{"qxOfferDisplay", record.isOffered}, {"qxOfferToggle", Array{record.excludedCarrier}}};
    if (record.daysBeforeEnd) toggles["qxOfferDurationDaysBeforeEndDate"] = *record.daysBeforeEnd;
    Dictionary coverage{{"featureToggleParameters", toggles},
                        {"qxLocalizedOfferLabel", title(language)},
                        {"qxLocalizedOfferCTA", label(static_cast<int>(answers_.size()) - 1)},
                        {"qxLocalizedOfferPluralDescFormat", "%@"},
                        {"qxLocalizedOfferSingularDesc", "1"}};
    if (record.until) coverage["qxOfferEligibleUntil"] = whole(platform::epochSeconds(dateOf(*record.until)));
    if (record.shownFrom)
        coverage["qxOfferFollowupDisplayDate"] = whole(platform::epochSeconds(dateOf(*record.shownFrom)));
    return coverage;
}

HttpAnswer World::answer(const platform::HttpRequest& request) {
    const std::string_view body(reinterpret_cast<const char*>(request.body.data()), request.body.size());
    const auto asked = host.json.parse(body);
    const std::string* serialNumber = asked ? (*asked)["serialNumber"].asString() : nullptr;
    const std::string* language = asked ? (*asked)["locale"].asString() : nullptr;
    if (!serialNumber || !language) return HttpAnswer::status(400);
    const auto record = records_.find(*serialNumber);
    const std::string fine =
        record == records_.end()
            ? ""
            : host.json.serialize(Value(coverage(*serialNumber, record->second, *language))).value();
    if (!outage_.empty()) return answerOfKind(outage_, fine);
    if (std::optional<HttpAnswer> troubled = troubledAnswer(serverTroubles_, fine)) return *std::move(troubled);
    return record == records_.end() ? HttpAnswer::status(404, "{}") : HttpAnswer::ok(fine);
}

// Kept for a while, then confirmed by its tag while it stays the same.
HttpAnswer World::versionsAnswer(const platform::HttpRequest& request) {
    const std::string fine =
        propertyList(Dictionary{{"LowServerVersion", lowVersion_}, {"HighServerVersion", highVersion_}});
    if (std::optional<HttpAnswer> troubled = troubledAnswer(versionTroubles_, fine)) return *std::move(troubled);
    const std::string tag = "\"" + std::to_string(lowVersion_) + "-" + std::to_string(highVersion_) + "\"";
    const auto known = request.headers.find("If-None-Match");
    const bool isKnown = known != request.headers.end() && known->second == tag;
    HttpAnswer answer = isKnown ? HttpAnswer::status(304) : HttpAnswer::ok(fine);
    answer.response.headers = {{"Cache-Control", "max-age=" + std::to_string(secondsVersionsAreKept)}, {"ETag", tag}};
    return answer;
}

std::optional<HttpAnswer> World::troubledAnswer(std::deque<std::string>& troubles, const std::string& fine) {
    if (troubles.empty()) return std::nullopt;
    serverTroubledAt_ = elapsed();
    const std::string kind = std::move(troubles.front());
    troubles.pop_front();
    return answerOfKind(kind, fine);
}

HttpAnswer World::answerOfKind(const std::string& kind, const std::string& fine) {
    if (kind == "cut") return HttpAnswer::failure();
    if (kind == "late") return HttpAnswer::ok(fine).after(Duration(28));
    if (kind == "never") return HttpAnswer::silence();
    if (kind == "malformed") return HttpAnswer::ok(fine.substr(0, fine.size() / 2));
    if (kind == "list") return HttpAnswer::ok("[[[[1, null]]]]");
    if (kind == "null") return HttpAnswer::ok(R"({"qxOfferEligibleUntil": null, "a": {"b": null}})");
    if (kind == "portal") return HttpAnswer::ok("<html>Sign in</html>");
    if (kind == "huge") return HttpAnswer::ok("{\"filler\": \"" + std::string(200'000, 'x') + "\"}");
    return HttpAnswer::status(static_cast<int>(numberFrom(kind)), "{}");
}

}  // namespace vrx::simulation
