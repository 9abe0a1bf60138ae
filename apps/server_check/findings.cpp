#include "server_check/findings.h"

#include <algorithm>
#include <cmath>
#include <map>
#include <set>

#include "vrx/codec/http_cache_rules.h"
#include "vrx/coverage/records/coverage_keys.h"
#include "vrx/devices/records/device_info.h"
#include "vrx/followup/follow_up_rules.h"
#include "vrx/platform/clock.h"
#include "vrx/platform/json.h"
#include "vrx/platform/number_text.h"
#include "vrx/platform/platform.h"
#include "vrx/platform/settings_keys.h"
#include "vrx/platform/text.h"
#include "vrx/platform/url.h"

namespace vrx::server_check {

using apps::ExitCode;
using platform::Date;
using platform::Dictionary;
using platform::Platform;
using platform::Value;

namespace {

namespace settings = platform::settings;

using Kind = CoverageKey::Kind;

Finding good(std::string name, std::string text) {
    return {std::move(name), Health::Good, std::move(text)};
}
Finding skipped(std::string name, std::string text) {
    return {std::move(name), Health::Skipped, std::move(text)};
}
Finding note(std::string name, std::string text, std::string advice = "") {
    return {std::move(name), Health::Note, std::move(text), std::move(advice)};
}
Finding problem(std::string name, std::string text, std::string advice, ExitCode code = ExitCode::NoAnswer) {
    return {std::move(name), Health::Problem, std::move(text), std::move(advice), code};
}

std::string joined(const std::vector<std::string>& texts) {
    std::string text;
    for (const std::string& part : texts) text.append(text.empty() ? "" : ", ").append(part);
    return text;
}

std::string pathOf(const CoverageKey& key) {
    return key.object.empty() ? std::string(key.key) : std::string(key.object) + "." + std::string(key.key);
}

const Value& objectAt(const Value& record, std::string_view object) {
    if (object.empty()) return record;
    const std::size_t dot = object.find('.');
    const Value& first = record[object.substr(0, dot)];
    return dot == object.npos ? first : first[object.substr(dot + 1)];
}

std::string typeName(const Value& value) {
    static constexpr const char* names[] = {"null",   "a flag", "a number", "a number", "a date",
                                            "a text", "data",   "a list",   "an object"};
    return names[static_cast<std::size_t>(value.type())];
}

// What clients take for granted of a value that the agent hands on.
enum class Shape { Text, List, Dictionary, Number };

Shape shapeOf(std::string_view path) {
    for (const std::string_view list :
         {"featureToggleParameters.qxOfferToggle", "coverage.coverageDetails", "coverage.benefitsCard.benefitDetails"})
        if (path == list) return Shape::List;
    if (path == "coverage" || path == "coverage.benefitsCard") return Shape::Dictionary;
    return path == "qxOfferBadgeBeforeEndDate" ? Shape::Number : Shape::Text;
}

bool hasShape(const Value& value, Shape shape) {
    switch (shape) {
        case Shape::Text: return value.asString();
        case Shape::List: return value.asArray();
        case Shape::Dictionary: return value.asDictionary();
        case Shape::Number: return value.asNumber() || value.asString();
    }
    return false;
}

// Numbers and flags are also read from texts, by what those begin with.
bool isReadable(const Value& value) {
    return value.asBool() || value.asNumber() || value.asString();
}

bool isPlainNo(const std::string& text) {
    const std::size_t begin = text.find_first_not_of(" \t\n\r+-0");
    return text.empty() || begin == text.npos || std::string_view("NnFf").find(text[begin]) != std::string_view::npos;
}

Finding ignored(const std::string& path, const Value& value, const char* expected) {
    if (value.isNull()) return note(path, "null, which reads as absent", "Leave the key out.");
    return problem(path, typeName(value) + ", where " + expected + " is read: it counts as absent",
                   "Send " + std::string(expected) + ".");
}

void judgeDate(const std::string& path, const Value& value, std::vector<Finding>& findings) {
    if (!value.isNumber()) return findings.push_back(ignored(path, value, "a number since 1970"));
    const std::optional<Date> date = VRXWarranty::_dateWithEpochNumber(value);
    const std::string advice = "Send seconds since 1970 up to 10000000000, or milliseconds above it.";
    if (!date) return findings.push_back(problem(path, value.description() + " reads as no date", advice));
    const auto time = platform::calendarTime(*date);
    if (!time || time->year < 2000 || time->year > 2100)
        findings.push_back(problem(path, value.description() + " reads as " + platform::describe(*date), advice));
}

void judgeFlag(const std::string& path, const Value& value, std::vector<Finding>& findings) {
    if (!isReadable(value)) return findings.push_back(ignored(path, value, "a flag"));
    if (const std::string* text = value.asString(); text && !platform::flagFromValue(value) && !isPlainNo(*text))
        findings.push_back(note(path, "the text " + *text + " reads as no", "Send true or false."));
}

void judgeDays(const std::string& path, const Value& value, std::vector<Finding>& findings) {
    if (!isReadable(value)) return findings.push_back(ignored(path, value, "a number of days"));
    const double days = platform::numberFromValue(value);
    const std::string* text = value.asString();
    if (text && days == 0 && text->find('0') == text->npos)
        findings.push_back(note(path, "the text " + *text + " reads as 0 days", "Send a number."));
    else if (!std::isfinite(days) || days < 0 || days > 3650)
        findings.push_back(note(path, platform::describe(days) + " days", "Is it a number of days?"));
}

void judgeAsSent(const std::string& path, const Value& value, std::vector<Finding>& findings) {
    static constexpr const char* expected[] = {"a text", "a list", "an object", "a number"};
    const Shape shape = shapeOf(path);
    if (!hasShape(value, shape)) {
        Finding found = ignored(path, value, expected[static_cast<std::size_t>(shape)]);
        findings.push_back(std::move(found));
    } else if (path == "qxLocalizedOfferPluralDescFormat" || path == "qxLocalizedOfferDetailsPluralEligibilityFormat") {
        if (value.asString()->find("%@") == std::string::npos)
            findings.push_back(note(path, "holds no %@ for the number of days", "Put one where the number belongs."));
    }
}

// The objects whose keys are read, and of each the keys.
std::map<std::string, std::set<std::string>> knownKeys() {
    std::map<std::string, std::set<std::string>> known{{"", {"featureToggleParameters"}}};
    for (const CoverageKey& key : coverageKeys()) known[std::string(key.object)].insert(std::string(key.key));
    return known;
}

void judgeKeys(const Value& record, std::vector<Finding>& findings) {
    if (const Value& toggles = record["featureToggleParameters"]; !toggles.asDictionary())
        if (record.asDictionary()->contains("featureToggleParameters"))
            findings.push_back(ignored("featureToggleParameters", toggles, "an object"));
    std::vector<std::string> inSeconds, inMilliseconds;
    std::size_t read = 0;
    std::set<std::string> counted;
    for (const CoverageKey& key : coverageKeys()) {
        const Value& object = objectAt(record, key.object);
        if (!object.asDictionary() || !object.asDictionary()->contains(key.key)) continue;
        const std::string path = pathOf(key);
        const Value& value = object[key.key];
        const std::size_t before = findings.size();
        switch (key.kind) {
            case Kind::Flag: judgeFlag(path, value, findings); break;
            case Kind::Date: judgeDate(path, value, findings); break;
            case Kind::Days: judgeDays(path, value, findings); break;
            case Kind::AsSent:
                if (!counted.contains(path)) judgeAsSent(path, value, findings);
        }
        if (key.kind == Kind::Date && before == findings.size())
            (*value.asNumber() > 1e10 ? inMilliseconds : inSeconds).push_back(path);
        if (counted.insert(path).second && before == findings.size()) ++read;
    }
    if (!inSeconds.empty() && !inMilliseconds.empty())
        findings.push_back(note("dates",
                                "in seconds: " + joined(inSeconds) + "; in milliseconds: " + joined(inMilliseconds),
                                "Both are read; one unit for all is easier to keep right."));
    std::vector<std::string> unknown;
    for (const auto& [object, keys] : knownKeys())
        if (const Dictionary* entries = objectAt(record, object).asDictionary())
            for (const auto& [key, value] : *entries)
                if (!keys.contains(key)) unknown.push_back(object.empty() ? key : object + "." + key);
    if (!unknown.empty())
        findings.push_back(note("other keys", "kept and handed on, but not read: " + joined(unknown)));
    findings.push_back(good("keys", std::to_string(read) + " were read"));
}

// By the rules of the agent's follow-ups, for a device that was activated long ago.
void judgeOffer(const std::shared_ptr<VRXWarranty>& record, std::vector<Finding>& findings) {
    const VRXDeviceInfo info(nullptr, record);
    const PostDecision decision = decidePost(info, {}, Platform::current().clock());
    const std::optional<Date> until = record->qxOfferEligibleUntil();
    switch (decision.reason) {
        case PostReason::NoRecord:
        case PostReason::Dismissed: return;
        case PostReason::NoOffer:
            if (record->qxOfferEligible())
                return findings.push_back(
                    note("offer",
                         "never shown: featureToggleParameters.qxOfferDisplay is not set, though qxOfferEligible is",
                         "Set it where the offer is to be shown."));
            return findings.push_back(good("offer", "none"));
        case PostReason::NoLongerEligible:
            if (!until)
                return findings.push_back(problem("offer", "never shown: qxOfferEligibleUntil is not there",
                                                  "Say until when the offer holds."));
            return findings.push_back(
                note("offer", "no longer shown: it ended at " + platform::describe(*until),
                     "Withdraw what has ended, by featureToggleParameters.qxOfferDisplay: devices "
                     "that never posted it ask again every quarter of an hour."));
        case PostReason::Due:
        case PostReason::DueLater: break;
    }
    const std::string from = platform::describe(decision.dueDate->date), end = platform::describe(*until);
    if (decision.dueDate->date >= *until)
        return findings.push_back(problem(
            "offer", "never shown: it is due at " + from + " and ends at " + end,
            "Correct qxOfferFollowupDisplayDate, or qxOfferDurationDaysBeforeEndDate, or qxOfferEligibleUntil."));
    std::vector<std::string> missing;
    for (const auto& [key, value] : {std::pair("qxLocalizedOfferLabel", record->qxLocalizedOfferLabel()),
                                     {"qxLocalizedOfferSingularDesc", record->qxLocalizedOfferSingularDesc()},
                                     {"qxLocalizedOfferPluralDescFormat", record->qxLocalizedOfferPluralDescFormat()},
                                     {"qxLocalizedOfferCTA", record->qxLocalizedOfferCTA()}})
        if (!value.asString()) missing.emplace_back(key);
    if (!missing.empty())
        findings.push_back(note("offer", "shown without a text for " + joined(missing), "Send these texts."));
    else
        findings.push_back(good("offer", "shown from " + from + " until " + end));
}

bool isTimeOut(const platform::HttpResponse& response) {
    constexpr int timedOut = 28;  // libcurl's code
    return response.error->code == timedOut;
}

Finding transportFailure(const std::string& name, const std::string& url, const platform::HttpResponse& response) {
    return problem(name, url + ": " + response.error->text, "Is the address right, and the server there?",
                   isTimeOut(response) ? ExitCode::TimedOut : ExitCode::NotReachable);
}

// Whether the answer of the version document is kept, which spares a request for each record.
Finding cachingOf(const Exchange& exchange) {
    const platform::HttpHeaders& headers = exchange.response.headers;
    const std::string name = "server version cache";
    if (exchange.response.status != 200 || !codec::mayStore(headers, exchange.arrived))
        return note(name, "not kept: it is asked for before each record",
                    "Send Cache-Control: max-age=SECONDS, or an ETag or Last-Modified.");
    const auto seconds = codec::freshnessLifetime(headers, exchange.arrived).count();
    const std::string confirmed = codec::revalidationHeaders(headers).empty() ? "" : ", then confirmed";
    return good(name, "kept for " + Value(seconds).description() + " s" + confirmed);
}

void judgeVersions(const CheckOptions& options, const Conversation& conversation, std::vector<Finding>& findings) {
    const std::string name = "server version";
    if (!options.serverVersionUrl) return findings.push_back(skipped(name, "--server-version names no document"));
    const std::string& url = *options.serverVersionUrl;
    if (!conversation.isServerVersionSupported)
        return findings.push_back(
            problem(name, url + " did not answer in time", "Is the address right?", ExitCode::TimedOut));
    const std::vector<Exchange>& exchanges = conversation.versionExchanges;
    const bool isFile = url.starts_with("file:");
    const std::string anyway = " The agent then goes by what it knew before, at first by its own versions.";
    if (!exchanges.empty() && exchanges.back().response.error)
        findings.push_back(transportFailure(name, url, exchanges.back().response));
    else if (!isFile && !exchanges.empty() && exchanges.back().response.status != 200)
        findings.push_back(problem(name, url + " answers with " + std::to_string(exchanges.back().response.status),
                                   "Serve the document with status 200." + anyway));
    else if (!conversation.versionErrors.empty())
        findings.push_back(problem(name, conversation.versionErrors.back(),
                                   "Serve a property list with LowServerVersion and HighServerVersion." + anyway));
    else if (!*conversation.isServerVersionSupported)
        findings.push_back(problem(
            name, "none is shared with the agent, whose versions are 2 and 3: " + conversation.versions.description(),
            "Until one is, nothing is downloaded."));
    else if (!conversation.isHighVersionShared)
        findings.push_back(note(name, "3 is not among them: watches have no records"));
    else
        findings.push_back(good(name, "shared with the agent"));
    std::vector<std::string> unknown;
    if (const Dictionary* entries = conversation.versions.asDictionary())
        for (const auto& [key, value] : *entries)
            if (key != settings::lowServerVersion && key != settings::highServerVersion) unknown.push_back(key);
    if (!unknown.empty()) findings.push_back(note("other versions", "not read: " + joined(unknown)));
    if (!isFile && !exchanges.empty() && !exchanges.back().response.error)
        findings.push_back(cachingOf(exchanges.back()));
}

// What kept the answer from being a record; nothing when it is one.
std::optional<Finding> failureOf(const CheckOptions& options, const Conversation& conversation) {
    const std::string name = "coverage";
    const std::vector<Exchange>& exchanges = conversation.coverageExchanges;
    const auto& errors = conversation.coverageErrors;
    if (conversation.record) return std::nullopt;
    if (conversation.isTimedOut)
        return problem(name, options.url + " did not answer in time", "An attempt of the agent's takes 30 seconds.",
                       ExitCode::TimedOut);
    if (exchanges.empty()) {
        const bool isFile = options.url.starts_with("file:");
        const std::string why = errors.empty() ? "an address that cannot be asked" : errors.front();
        return problem(name, "not asked: " + why,
                       isFile ? "Name a property list."
                              : "Name the address whole; or a token by --token, or a profile with an account and a "
                                "helper by --device.");
    }
    const platform::HttpResponse& last = exchanges.back().response;
    if (last.error && last.status == 0) return transportFailure(name, options.url, last);
    if (last.error)
        return problem(name, "broke off: " + last.error->text, "The answer must be whole, and 4 MiB at most.",
                       isTimeOut(last) ? ExitCode::TimedOut : ExitCode::NoAnswer);
    if (last.status == 401)
        return problem(name, "the token was refused " + std::to_string(exchanges.size()) + " times",
                       "Name a valid one by --token.", ExitCode::Refused);
    if (last.status >= 300 && last.status < 400)
        return problem(name, "status " + std::to_string(last.status) + ": a redirect of this request is not followed",
                       "Answer with the record, status 200.");
    if (last.status != 200)
        return problem(name, "status " + std::to_string(last.status) + ": no record", "Answer with status 200.");
    const platform::Data body = last.body.value_or(platform::Data());
    const auto json = Platform::current().json().parse({reinterpret_cast<const char*>(body.data()), body.size()});
    return problem(name, json ? typeName(*json) + ", which is no record" : json.error().text,
                   "Answer with a JSON object.");
}

void judgeCoverage(const CheckOptions& options, const Conversation& conversation, std::vector<Finding>& findings) {
    if (auto failure = failureOf(options, conversation)) return findings.push_back(*std::move(failure));
    const std::size_t attempts = conversation.coverageExchanges.size();
    if (attempts > 1)
        findings.push_back(note("coverage", "a record, after the token was refused " + std::to_string(attempts - 1) +
                                                (attempts == 2 ? " time" : " times")));
    else
        findings.push_back(good("coverage", "a record"));
    const Value record = conversation.record->dictionaryRepresentation();
    if (conversation.keptRecord && conversation.keptRecord->isEqual(conversation.record.get()))
        findings.push_back(good("disk", "kept whole"));
    else
        findings.push_back(problem("disk", "the record cannot be kept: an older one, or none, stays in its place",
                                   "Leave out keys instead of sending null."));
    judgeKeys(record, findings);
    judgeOffer(conversation.record, findings);
}

}  // namespace

std::vector<Finding> findingsOf(const CheckOptions& options, const Conversation& conversation) {
    std::vector<Finding> findings;
    judgeVersions(options, conversation, findings);
    // Where the versions took all the time, the record has not been asked for.
    if (conversation.isServerVersionSupported || !options.serverVersionUrl)
        judgeCoverage(options, conversation, findings);
    return findings;
}

std::vector<ReadKey> readKeysOf(const Value& record) {
    std::vector<ReadKey> keys;
    for (const CoverageKey& key : coverageKeys()) {
        const Value& object = objectAt(record, key.object);
        if (!object.asDictionary() || !object.asDictionary()->contains(key.key)) continue;
        ReadKey entry{.path = pathOf(key), .kind = "", .sent = object[key.key], .read = nullptr};
        switch (key.kind) {
            case Kind::Flag:
                entry.kind = "flag";
                entry.read = platform::flagFromValue(entry.sent);
                break;
            case Kind::Date:
                entry.kind = "date";
                if (const auto date = VRXWarranty::_dateWithEpochNumber(entry.sent)) entry.read = *date;
                break;
            case Kind::Days:
                entry.kind = "days";
                entry.read = platform::numberFromValue(entry.sent);
                break;
            case Kind::AsSent: {
                static constexpr const char* kinds[] = {"text", "list", "dictionary", "number"};
                const Shape shape = shapeOf(entry.path);
                entry.kind = kinds[static_cast<std::size_t>(shape)];
                if (hasShape(entry.sent, shape)) entry.read = entry.sent;
            }
        }
        keys.push_back(std::move(entry));
    }
    return keys;
}

}  // namespace vrx::server_check
