// What must hold whatever a fuzzer is fed; where it does not, the fuzzer reports a crash.
#pragma once

#include <cstdlib>

inline void require(bool holds) {
    if (!holds) std::abort();
}
