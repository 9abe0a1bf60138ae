// Makes a life from a seed: the same one for the same seed and level, with every compiler.
#pragma once

#include "vrxsim/life.h"

namespace vrx::simulation {

Life lifeFromSeed(std::uint64_t seed, Trouble level);

}  // namespace vrx::simulation
