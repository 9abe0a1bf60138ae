// Makes a life that breaks a rule as small and plain as it can be while it still breaks the same rule.
#pragma once

#include <functional>
#include <string>

#include "vrx/sim/interference.h"
#include "vrxsim/life.h"

namespace vrx::simulation {

// The rule that a life breaks; empty for none.
using BrokenRule = std::function<std::string(const Life& life)>;

// The life must break a rule. Takes events away and makes words and times plain until nothing more can go.
Life shrunk(Life life, const BrokenRule& brokenRule);

}  // namespace vrx::simulation
