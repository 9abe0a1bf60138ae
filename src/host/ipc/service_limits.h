// What the service allows its clients at most. The defaults are the agent's; tests use smaller ones.
#pragma once

#include <chrono>
#include <cstddef>

#include "vrx/platform/limits.h"

namespace vrx::host {

struct ServiceLimits {
    std::size_t connections = platform::limits::connections;
    std::size_t requestsPerConnection = platform::limits::requestsPerConnection;
    std::size_t requests = platform::limits::requests;
    std::size_t requestsPerUser = platform::limits::requestsPerUser;
    std::size_t unsentBytesPerConnection = platform::limits::unsentBytesPerConnection;
    std::size_t unsentBytes = platform::limits::unsentBytes;
    // Time for a client to authenticate itself. Afterwards it may be silent for any time.
    std::chrono::milliseconds authentication{5'000};
    // Refused clients that are told why at the same time, and how long one may take to listen.
    std::size_t refusals = 64;
    std::chrono::milliseconds refusal{2'000};
};

}  // namespace vrx::host
