// The one place that knows all parts of the agent: it makes them at the start of the process, in a fixed order, and
// keeps them until its end. Main thread.
#pragma once

#include <memory>

#include "platform/service_listener.h"
#include "service/service_delegate.h"

namespace vrx {

class VRXAgent;

class StartUp {
public:
    // Does all of start-up up to the open listener; the program then runs its main loop. The current platform must be
    // set.
    StartUp();

private:
    ServiceDelegate delegate_;
    std::shared_ptr<VRXAgent> agent_;  // of the settings app
    std::unique_ptr<platform::ServiceListener> listener_;
};

}  // namespace vrx
