// What can go wrong on request: the kinds of faults, how they are written, and the list from which each request takes
// its own.
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
    std::string_view defaultValue;  // none: the value has to be given
    bool bendsAnswer;               // the genuine answer is made first, and its effects take place
    bool suitsConnection;           // can happen before there is a request
    std::string_view help;
};
const std::vector<FaultKindInfo>& faultKinds();

struct Fault {
    std::uint64_t id = 0;
    Endpoint endpoint = Endpoint::Any;
    const FaultKindInfo* kind = nullptr;
    std::string value;
    std::uint64_t number = 0;            // of a value that is a status or a size
    std::chrono::milliseconds time{0};   // of a value that is a duration
    std::uint64_t skip = 0;              // requests that pass before it begins
    std::optional<std::uint64_t> count;  // requests that it happens to; without one, all
    int code = 302;                      // of a redirect

    std::string spec() const;
};

// "ENDPOINT:KIND[=VALUE][,count=N][,skip=N][,code=N]". Throws std::invalid_argument, whose text says what is wrong.
Fault parseFault(std::string_view spec);

// What happens to one request, or to one connection: waiting, then at most one thing more.
struct FaultPlan {
    std::chrono::milliseconds delay{0};
    std::vector<std::uint64_t> holds;  // the ids of faults whose removal it waits for
    std::optional<Fault> fault;
    std::string description;  // empty when nothing happens
};

// Any thread may use it.
class FaultList {
public:
    std::uint64_t add(Fault fault);
    bool remove(std::uint64_t id);
    void clear();
    // In the order in which they were added: every delay and hold that applies, and the first other fault that does. A
    // fault counts a request as passed, or as its own, only when no earlier one of these others has taken it.
    FaultPlan take(Endpoint endpoint);
    // Whether a fault that the plan waits for is still there.
    bool holds(const FaultPlan& plan) const;
    Json json() const;  // an id and a description each

private:
    mutable std::mutex mutex_;
    std::uint64_t lastId_ = 0;
    std::vector<Fault> faults_;
};

}  // namespace vrx::coverage_server
