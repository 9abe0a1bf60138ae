// An activity that the system wakes: what a scheduler needs of it.
#pragma once

#include <memory>
#include <string>

#include "platform/background_activity_scheduler.h"
#include "platform/task.h"

namespace vrx {

class VRXScheduler;

class VRXSchedulerActivityDelegate {
public:
    using CompletionHandler = platform::OnceCallback<platform::BackgroundActivityResult>;

    virtual ~VRXSchedulerActivityDelegate() = default;
    // The activity's identifier, also the stem of its target date's key.
    virtual std::string identifier() const = 0;
    virtual bool requiresNetwork() const = 0;
    // Runs the work, on a thread of the system's, and answers once, on any thread.
    virtual void performActivityForScheduler(const std::shared_ptr<VRXScheduler>& scheduler,
                                             CompletionHandler completionHandler) = 0;
};

}  // namespace vrx
