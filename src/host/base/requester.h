// For whom a thread works: the user of the client that has asked, or the agent itself. Work that is posted is done for
// whom it was posted, so that what clients cause can be told from what the agent needs.
#pragma once

#include <sys/types.h>

#include <optional>
#include <utility>

#include "vrx/platform/task.h"

namespace vrx::host {

// A user, or nothing for the agent's own work.
using Requester = std::optional<uid_t>;

// While one is alive, its thread works for that requester.
class RequesterScope {
public:
    explicit RequesterScope(Requester requester) : previous_(std::exchange(current_, requester)) {}
    ~RequesterScope() { current_ = previous_; }
    RequesterScope(const RequesterScope&) = delete;
    RequesterScope& operator=(const RequesterScope&) = delete;

    static Requester current() { return current_; }

private:
    static inline thread_local Requester current_;
    const Requester previous_;
};

// The task, for whom this thread works now.
inline platform::Task forCurrentRequester(platform::Task task) {
    const Requester requester = RequesterScope::current();
    if (!requester) return task;
    return [requester, task = std::move(task)] {
        const RequesterScope scope(requester);
        task();
    };
}

}  // namespace vrx::host
