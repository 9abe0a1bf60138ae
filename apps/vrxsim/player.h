// Plays a life: the agent as it is shipped, on the simulated host, from its first start to the last day. One thread;
// one play at a time in a process.
#pragma once

#include <cstdint>
#include <functional>
#include <map>
#include <optional>
#include <string>

#include "timeline/chronicle.h"
#include "vrx/sim/http.h"
#include "vrx/sim/interference.h"
#include "vrxsim/differences.h"
#include "vrxsim/life.h"
#include "vrxsim/verdict.h"

namespace vrx::simulation {

struct PlayOptions {
    sim::Defect planted = sim::Defect::None;            // in the simulated host
    std::function<void(std::string_view line)> show{};  // gets what happens, line by line
    bool isJudged = true;                               // else no rule is looked at, and neither log nor trace is made
    std::function<void(const sim::SentRequest& sent)> takeSent{};  // gets each request that leaves the device
    double shareOfGrace = 0;                                       // by which each firing is put off, from 0 to 1
    bool isRecorded = false;                                       // for a chronicle
};

struct Play {
    std::uint64_t trace = 0;  // equal for equal plays
    double days = 0;          // up to the end, or to the violation
    std::optional<Violation> violation{};
    std::optional<timeline::Chronicle> chronicle{};
    DifferentSeconds differences{};
    std::map<std::string, std::int64_t> restlessDays{};  // by activity: on which it ran as often as it can
};

Play play(const Life& life, const PlayOptions& options = {});

}  // namespace vrx::simulation
