// Plays a life: the agent as it is shipped, on the simulated host, from its first start to the last day. One thread;
// one play at a time in a process.
#pragma once

#include <functional>
#include <optional>

#include "vrx/sim/interference.h"
#include "vrxsim/differences.h"
#include "vrxsim/life.h"
#include "vrxsim/verdict.h"

namespace vrx::simulation {

struct PlayOptions {
    sim::Defect planted = sim::Defect::None;            // in the simulated host
    std::function<void(std::string_view line)> show{};  // gets what happens, line by line
};

struct Play {
    std::uint64_t trace = 0;  // equal for equal plays
    double days = 0;          // up to the end, or to the violation
    std::optional<Violation> violation{};
    DifferentSeconds differences{};
};

Play play(const Life& life, const PlayOptions& options = {});

}  // namespace vrx::simulation
