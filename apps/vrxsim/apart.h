// Plays in processes of their own, because the platform is one for a process, and because what goes wrong may end it.
#pragma once

#include <chrono>
#include <functional>
#include <optional>

#include "vrxsim/player.h"

namespace vrx::simulation {

// The rule that a play breaks which ends the process or takes too long.
inline constexpr const char* crash = "crash";

Play playApart(const Life& life, sim::Defect planted = sim::Defect::None);

struct Exploration {
    std::uint64_t first = 1, last = 1;  // seeds
    Trouble level = Trouble::Rough;
    sim::Defect planted = sim::Defect::None;
    int jobs = 1;
    std::int64_t mostDays = 4000;                                // of each life
    std::optional<std::chrono::steady_clock::time_point> end{};  // after which no life is begun
};

// Plays the lives of the seeds, each as it would alone, and passes the plays on as they end. It stops when the taker
// returns false.
void explore(const Exploration& exploration, const std::function<bool(std::uint64_t seed, const Play& play)>& take);

}  // namespace vrx::simulation
