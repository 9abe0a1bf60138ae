// Lets the process end while it is idle. Nothing is lost: the system starts a new process when one is needed. Any
// thread may use it.
#pragma once

#include <memory>

namespace vrx::platform {

// While one is alive, work is in flight and the process does not exit.
using WorkInFlight = std::shared_ptr<void>;

class ProcessLifecycle {
public:
    virtual ~ProcessLifecycle() = default;
    // Ends the process, with success, as soon as no work is in flight. Requests and running activities count as work in
    // flight by themselves.
    virtual void exitCleanWhenIdle() = 0;
    // Never null.
    virtual WorkInFlight beginWork() = 0;
};

}  // namespace vrx::platform
