#include "vrx/client/caller.h"

#include <algorithm>

#include "vrx/client/local_platform.h"
#include "vrx/wire/locations.h"

namespace vrx::client {

Caller::Caller(ConnectionOptions options)
    : timeLimit_(options.timeLimit),
      pool_(std::make_shared<BusPool>(
          options.socketPath.empty() ? wire::findAgent().socket.path : std::move(options.socketPath),
          options.connections)),
      workers_(options.connections) {
    installPlatformIfNone();
}

Deadline Caller::deadline() const {
    constexpr platform::Duration century{100.0 * 366 * 86400};
    return std::chrono::steady_clock::now() +
           std::chrono::duration_cast<std::chrono::steady_clock::duration>(std::min(timeLimit_, century));
}

}  // namespace vrx::client
