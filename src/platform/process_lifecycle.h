// The end of the process, which comes without loss: what the process is needed for, the system starts it anew for. Any
// thread may use it.
#pragma once

#include <memory>

namespace vrx::platform {

// While one is alive the process has something under way and doesn't exit.
using WorkInFlight = std::shared_ptr<void>;

class ProcessLifecycle {
public:
    virtual ~ProcessLifecycle() = default;
    // Lets the process end, with success, as soon as nothing is under way. Requests and running activities count by
    // themselves.
    virtual void exitCleanWhenIdle() = 0;
    // Never null.
    virtual WorkInFlight beginWork() = 0;
};

}  // namespace vrx::platform
