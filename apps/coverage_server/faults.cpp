#include "coverage_server/faults.h"

#include <algorithm>
#include <charconv>
#include <cmath>
#include <stdexcept>

namespace vrx::coverage_server {

namespace {

constexpr std::pair<Endpoint, std::string_view> endpoints[] = {{Endpoint::Coverage, "coverage"},
                                                               {Endpoint::ServerVersion, "server-version"},
                                                               {Endpoint::Token, "token"},
                                                               {Endpoint::Catalogue, "catalogue"},
                                                               {Endpoint::Purchases, "purchases"},
                                                               {Endpoint::Connection, "connection"},
                                                               {Endpoint::Any, "any"}};

[[noreturn]] void refuse(const std::string& what) {
    throw std::invalid_argument(what);
}

std::uint64_t wholeNumber(std::string_view text, const char* what) {
    std::uint64_t number = 0;
    const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), number);
    if (error != std::errc() || end != text.data() + text.size())
        refuse(std::string(what) + " is no whole number: " + std::string(text));
    return number;
}

// The number at the beginning of the text, times the factor of the unit behind it.
double measured(std::string_view text, std::initializer_list<std::pair<std::string_view, double>> units,
                const char* what) {
    double number = 0;
    const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), number);
    const std::string_view unit(end, static_cast<std::size_t>(text.data() + text.size() - end));
    for (const auto& [name, factor] : units)
        if (error == std::errc() && unit == name && number >= 0 && number * factor < 1e12) return number * factor;
    refuse(std::string(text) + " is no " + what);
}

double bytes(std::string_view text) {
    return measured(text, {{"", 1}, {"KiB", 1024}, {"MiB", 1024 * 1024}, {"GiB", 1024 * 1024 * 1024}},
                    "size, such as 4096, 64KiB, 100MiB, 1GiB");
}

double milliseconds(std::string_view text) {
    return measured(text, {{"", 1000}, {"s", 1000}, {"ms", 1}, {"m", 60'000}},
                    "duration, such as 1.5, 1.5s, 200ms, 2m");
}

void setValue(Fault& fault, std::optional<std::string> value) {
    const FaultKindInfo& kind = *fault.kind;
    const std::string name(kind.name);
    if (kind.value == FaultValue::None) {
        if (value) refuse(name + " takes no value");
        return;
    }
    if (!value && kind.defaultValue == "none") refuse(name + " needs a value");
    fault.value = value.value_or(std::string(kind.defaultValue));
    if (kind.value == FaultValue::Size) fault.number = static_cast<std::uint64_t>(bytes(fault.value));
    if (kind.value == FaultValue::Duration)
        fault.time = std::chrono::milliseconds(std::llround(milliseconds(fault.value)));
    if (kind.value == FaultValue::Status) {
        fault.number = wholeNumber(fault.value, "the status");
        if (fault.number < 200 || fault.number > 999) refuse("the status is not within 200 and 999: " + fault.value);
    }
}

bool holdsNulls(Endpoint endpoint) {
    return endpoint == Endpoint::Coverage || endpoint == Endpoint::Catalogue || endpoint == Endpoint::Purchases;
}

Fault makeFault(std::string_view endpoint, std::string_view kind, std::optional<std::string> value) {
    Fault fault;
    const auto* found = std::ranges::find(endpoints, endpoint, &std::pair<Endpoint, std::string_view>::second);
    if (found == std::end(endpoints))
        refuse("no such endpoint: " + std::string(endpoint) +
               " (coverage, server-version, token, catalogue, purchases, connection, any)");
    fault.endpoint = found->first;
    const auto& kinds = faultKinds();
    const auto info = std::ranges::find(kinds, kind, &FaultKindInfo::name);
    if (info == kinds.end()) refuse("no such fault: " + std::string(kind));
    fault.kind = &*info;
    if (fault.endpoint == Endpoint::Connection && !info->suitsConnection)
        refuse(std::string(kind) +
               " needs a request; a connection can only be met by delay, close, reset, hang, not-http");
    if (info->kind == FaultKind::Nulls && !holdsNulls(fault.endpoint))
        refuse("nulls is for coverage, catalogue and purchases only: no other answer can hold one");
    setValue(fault, std::move(value));
    return fault;
}

void setOption(Fault& fault, std::string_view name, std::uint64_t number) {
    if (name == "count")
        fault.count = number;
    else if (name == "skip")
        fault.skip = number;
    else if (fault.kind->kind != FaultKind::Redirect || number < 300 || number > 399)
        refuse("code is the status of a redirect, within 300 and 399");
    else
        fault.code = static_cast<int>(number);
}

}  // namespace

std::string_view nameOf(Endpoint endpoint) {
    return std::ranges::find(endpoints, endpoint, &std::pair<Endpoint, std::string_view>::first)->second;
}

const std::vector<FaultKindInfo>& faultKinds() {
    using enum FaultKind;
    static const std::vector<FaultKindInfo> kinds = {
        {Status, "status", FaultValue::Status, "none", false, false, "answers with this status and a JSON reason"},
        {Delay, "delay", FaultValue::Duration, "none", true, true, "waits first; the next fault applies as well"},
        {Hold, "hold", FaultValue::None, "", true, false, "the same, until the fault is removed"},
        {Drop, "drop", FaultValue::None, "", true, false, "sends head and half of the body, then ends the connection"},
        {Reset, "reset", FaultValue::None, "", false, true, "resets the connection instead of answering"},
        {Close, "close", FaultValue::None, "", false, true, "closes the connection instead of answering"},
        {Hang, "hang", FaultValue::None, "", false, true, "never answers and keeps the connection open"},
        {Garbage, "garbage", FaultValue::Size, "4KiB", false, false, "answers 200 with this many random bytes as body"},
        {NotHttp, "not-http", FaultValue::Size, "1KiB", false, true, "sends random bytes in place of HTTP (or of TLS)"},
        {NotJson, "not-json", FaultValue::None, "", false, false, "answers 200 with an HTML page of a sign-in portal"},
        {Array, "array", FaultValue::None, "", true, false, "answers with an array as the document's root"},
        {Nulls, "nulls", FaultValue::Text, "", true, false,
         "makes null of every member of the record, or of the store's entries, or of the named"},
        {Body, "body", FaultValue::Text, "none", false, false, "answers 200 with this body"},
        {Empty, "empty", FaultValue::None, "", false, false, "answers 200 with an empty body"},
        {Large, "large", FaultValue::Size, "100MiB", false, false, "answers 200 with a valid document of this size"},
        {Bomb, "bomb", FaultValue::Size, "1100MiB", false, false, "the same, gzip-compressed to a thousandth of it"},
        {Deep, "deep", FaultValue::Size, "100000", false, false, "answers 200 with arrays nested this deep"},
        {Redirect, "redirect", FaultValue::Text, "/moved", false, false, "redirects to this path or URL"},
        {Drip, "drip", FaultValue::Duration, "100ms", true, false, "sends one byte of the body each this long"},
        {LengthLong, "length-long", FaultValue::Size, "100", true, false,
         "promises more bytes than it sends, and stays"},
        {LengthShort, "length-short", FaultValue::Size, "10", true, false, "sends more bytes than it promises"},
        {LargeHeaders, "large-headers", FaultValue::Size, "1MiB", false, false,
         "answers 200 with headers of this size"},
    };
    return kinds;
}

std::string Fault::spec() const {
    std::string text = std::string(nameOf(endpoint)).append(":").append(kind->name);
    if (!value.empty()) text += "=" + value;
    if (count) text += ",count=" + std::to_string(*count);
    if (skip) text += ",skip=" + std::to_string(skip);
    if (kind->kind == FaultKind::Redirect) text += ",code=" + std::to_string(code);
    return text;
}

Fault parseFault(std::string_view spec) {
    const std::size_t colon = spec.find(':');
    if (colon == spec.npos) refuse("a fault is ENDPOINT:KIND[=VALUE][,count=N][,skip=N][,code=N]");
    std::string_view kind = spec.substr(colon + 1);
    // The options are split off from the end, because the value may contain commas.
    std::vector<std::pair<std::string_view, std::uint64_t>> options;
    while (true) {
        const std::size_t comma = kind.rfind(',');
        if (comma == kind.npos) break;
        const std::string_view option = kind.substr(comma + 1);
        const std::size_t equals = std::min(option.find('='), option.size());
        const std::string_view name = option.substr(0, equals);
        if (name != "count" && name != "skip" && name != "code") break;
        options.emplace_back(name, wholeNumber(option.substr(std::min(equals + 1, option.size())), "an option"));
        kind = kind.substr(0, comma);
    }
    const std::size_t equals = kind.find('=');
    std::optional<std::string> value;
    if (equals != kind.npos) value = kind.substr(equals + 1);
    Fault fault = makeFault(spec.substr(0, colon), kind.substr(0, equals), std::move(value));
    for (const auto& [name, number] : options) setOption(fault, name, number);
    return fault;
}

std::uint64_t FaultList::add(Fault fault) {
    std::lock_guard lock(mutex_);
    fault.id = ++lastId_;
    faults_.push_back(std::move(fault));
    return lastId_;
}

bool FaultList::remove(std::uint64_t id) {
    std::lock_guard lock(mutex_);
    return std::erase_if(faults_, [id](const Fault& fault) { return fault.id == id; }) > 0;
}

void FaultList::clear() {
    std::lock_guard lock(mutex_);
    faults_.clear();
}

FaultPlan FaultList::take(Endpoint endpoint) {
    std::lock_guard lock(mutex_);
    FaultPlan plan;
    for (Fault& fault : faults_) {
        const bool isAny = fault.endpoint == Endpoint::Any && endpoint != Endpoint::Connection;
        if ((fault.endpoint != endpoint && !isAny) || fault.count == 0u) continue;
        if (fault.skip > 0) {
            --fault.skip;
            continue;
        }
        if (fault.count) --*fault.count;
        if (!plan.description.empty()) plan.description += " ";
        plan.description.append(fault.kind->name);
        if (!fault.value.empty()) plan.description += "=" + fault.value;
        if (fault.kind->kind == FaultKind::Delay) {
            plan.delay += fault.time;
        } else if (fault.kind->kind == FaultKind::Hold) {
            plan.holds.push_back(fault.id);
        } else {
            plan.fault = fault;
            break;
        }
    }
    return plan;
}

bool FaultList::holds(const FaultPlan& plan) const {
    std::lock_guard lock(mutex_);
    return std::ranges::any_of(faults_,
                               [&](const Fault& fault) { return std::ranges::count(plan.holds, fault.id) > 0; });
}

Json FaultList::json() const {
    std::lock_guard lock(mutex_);
    Json list = Json::array();
    for (const Fault& fault : faults_) list.push_back({{"id", fault.id}, {"fault", fault.spec()}});
    return list;
}

}  // namespace vrx::coverage_server
