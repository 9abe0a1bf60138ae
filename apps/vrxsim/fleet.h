// Many ordinary devices at once: what the servers see of them, minute by minute. Devices know nothing of each other, so
// their requests add up, and fewer lives than devices can stand for all of them.
#pragma once

#include <array>
#include <cstdint>
#include <functional>
#include <map>
#include <string>
#include <string_view>
#include <vector>

#include "vrxsim/population.h"

namespace vrx::simulation {

inline constexpr std::int64_t minutesOfDay = 24 * 60;

enum class Server : std::uint8_t { Coverage, Versions };
inline constexpr std::size_t serverCount = 2;

// What began a request. A request that is sent again after a refusal of its token is a retry, whatever began it.
enum class Cause : std::uint8_t { Outreach, Post, Language, Pairing, Look, Refresh, Retry, Other };
inline constexpr std::size_t causeCount = 8;

// "coverage", and "outreach": words for documents and pictures.
std::string_view describe(Server server);
std::string_view describe(Cause cause);

// The requests of one server.
class Counts {
public:
    // By minutes since the beginning.
    std::array<std::vector<std::uint32_t>, causeCount> minutes{};
    std::uint64_t requests = 0;
    std::uint64_t squares = 0;              // the sum of the squares of each life's number of requests
    std::uint64_t unchanged = 0;            // answered with 304
    std::uint64_t doubled = 0;              // sent by a device that had the same request under way
    std::uint64_t connections = 0;          // that a device opens if it closes one after five seconds without a request
    std::uint64_t connectionsKeptLong = 0;  // and after two minutes

    std::uint64_t total(Cause cause) const;
    std::uint64_t inMinute(std::size_t minute) const;
    void add(const Counts& other);
};

struct Census {
    std::uint64_t lives = 0;
    std::array<Counts, serverCount> servers{};
};

struct Fleet {
    Scenario scenario{};
    std::uint64_t lives = 1;
    std::uint64_t firstNumber = 1;  // of the residents
    int jobs = 1;
};

// Plays the lives, some at a time, each in a process that plays others too. The result does not depend on the number of
// jobs. The error tells how a process ended that should not have.
platform::Result<Census> census(const Fleet& fleet, const std::function<void(std::uint64_t lives)>& progress = {});

// Adds one life to what was counted, in this process.
void count(const Resident& resident, const Scenario& scenario, Census& census);

}  // namespace vrx::simulation
