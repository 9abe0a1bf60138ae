// Ordinary devices: what the lives of many users' devices are like when nothing is wrong, and what happens to all of
// them. The numbers are estimates, and all of them stand in population.cpp.
#pragma once

#include <cstdint>
#include <optional>
#include <string>

#include "vrxsim/life.h"

namespace vrx::simulation {

// What happens to the devices, in days since the beginning, which is 00:00 UTC. Days may be fractions.
struct Scenario {
    std::int64_t days = 30;
    bool hasImage = true;   // all devices get the agent with an image at the beginning; else they have had it for long
    double overHours = 24;  // within which image, upgrade or language reach all devices that they will reach
    std::optional<double> upgrade{};   // a newer agent
    std::optional<double> language{};  // a change of language
    double languageShare = 10;         // percent of the users that make it
    std::optional<double> outage{};    // of the coverage server
    double outageHours = 6;
    std::string outageAnswer = "503";  // a status, or as World has it
    double endedShare = 0;             // percent of phones that the server keeps offering what ended before
    bool isSpread = false;             // activities fire at any moment of their grace period
};

struct Resident {
    Life life{};
    std::int64_t begin = 0;   // of the life, in seconds since the beginning of the scenario; below 0 before it
    double shareOfGrace = 0;  // by which its activities fire later
};

// The same device for the same number, whatever the others are.
Resident residentFrom(std::uint64_t number, const Scenario& scenario);

}  // namespace vrx::simulation
