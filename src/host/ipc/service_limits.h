// What the service lets its clients take at the most. The defaults are the agent's; tests use smaller ones.
#pragma once

#include <chrono>
#include <cstddef>

#include "vrx/platform/limits.h"

namespace vrx::host {

struct ServiceLimits {
    std::size_t connections = platform::limits::connections;
    std::size_t requestsPerConnection = platform::limits::requestsPerConnection;
    // For a client to authenticate itself; it may then be silent for as long as it likes.
    std::chrono::milliseconds authentication{10'000};
    // Refused clients that are told why at the same time, and how long one may take to listen.
    std::size_t refusals = 16;
    std::chrono::milliseconds refusal{2'000};
};

}  // namespace vrx::host
