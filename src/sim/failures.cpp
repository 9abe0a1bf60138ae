#include "vrx/sim/failures.h"

#include <cstdio>
#include <cstdlib>

namespace vrx::sim {

void Failures::report(const std::string& text) const {
    if (handler) return handler(text);
    std::fprintf(stderr, "simulated host: %s\n", text.c_str());
    std::abort();
}

}  // namespace vrx::sim
