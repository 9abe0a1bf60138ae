// The faults that the server can be told to make: their kinds, how they are written, and the list of those ordered,
// from which each request takes its own.
#pragma once

#include <chrono>
#include <cstdint>
#include <mutex>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "coverage_server/json.h"

namespace vrx::coverage_server {

enum class Endpoint { Coverage, ServerVersion, Token, Catalogue, Purchases, Connection, Any };
std::string_view nameOf(Endpoint endpoint);

enum class FaultKind {
    Status,
    Delay,
    Hold,
    Drop,
    Reset,
    Close,
    Hang,
    Garbage,
    NotHttp,
    NotJson,
    Array,
    Nulls,
    Body,
    Empty,
    Large,
    Bomb,
    Deep,
    Redirect,
    Drip,
    LengthLong,
    LengthShort,
    LargeHeaders
};

enum class FaultValue { None, Status, Size, Duration, Text };

struct FaultKindInfo {
    FaultKind kind;
    std::string_view name;
    FaultValue value;
    std::string_view defaultValue;  // "none": a value must be given
    bool bendsAnswer;               // the genuine answer is made first, with its effects
    bool suitsConnection;           // can happen before a request
    std::string_view help;
};
const std::vector<FaultKindInfo>& faultKinds();

struct Fault {
    std::uint64_t id = 0;
    Endpoint endpoint = Endpoint::Any;
    const FaultKindInfo* kind = nullptr;
    std::string value;
    std::uint64_t number = 0;            // the value, if it is a status or a size
    std::chrono::milliseconds time{0};   // the value, if it is a duration
    std::uint64_t skip = 0;              // requests that pass unharmed before it begins
    std::optional<std::uint64_t> count;  // requests that it still happens to; null for all
    int code = 302;                      // the status of a redirect

    std::string spec() const;
};

// Reads "ENDPOINT:KIND[=VALUE][,count=N][,skip=N][,code=N]". Throws std::invalid_argument, which says what is wrong.
Fault parseFault(std::string_view spec);

// What happens to one request or connection: it waits, and then has at most one other fault.
struct FaultPlan {
    std::chrono::milliseconds delay{0};
    std::vector<std::uint64_t> holds;  // ids of the faults until whose removal it waits
    std::optional<Fault> fault;
    std::string description;  // for the log; empty when nothing happens
};

// Any thread may use it.
class FaultList {
public:
    std::uint64_t add(Fault fault);
    bool remove(std::uint64_t id);
    void clear();
    // Takes every delay and hold that applies, in the order in which they were added, up to and with the first other
    // fault that applies. The faults after that one do not see the request: their skip and count stay.
    FaultPlan take(Endpoint endpoint);
    // Whether a fault until whose removal the plan waits is still there.
    bool holds(const FaultPlan& plan) const;
    Json json() const;  // a list of ids and descriptions

private:
    mutable std::mutex mutex_;
    std::uint64_t lastId_ = 0;
    std::vector<Fault> faults_;
};

}  // namespace vrx::coverage_server
