// An activity that the system wakes: what a scheduler needs of it.
#pragma once

#include <memory>
#include <string>

#include "vrx/platform/background_activity_scheduler.h"
#include "vrx/platform/property.h"
#include "vrx/platform/task.h"

namespace vrx {

class VRXScheduler;

class VRXSchedulerActivityDelegate {
public:
    using CompletionHandler = platform::OnceCallback<platform::BackgroundActivityResult>;

    virtual ~VRXSchedulerActivityDelegate() = default;
    // The activity's identifier, with which the key of its target date begins.
    virtual std::string identifier() const = 0;
    virtual bool requiresNetwork() const = 0;
    // Runs the work, on one of the system's threads. It answers once, on any thread.
    virtual void performActivityForScheduler(const std::shared_ptr<VRXScheduler>& scheduler,
                                             CompletionHandler completionHandler) = 0;

    // Whether a run is under way, from its firing until the system has its result. Scheduling the activity by this
    // object meanwhile is done by the run itself.
    bool isRunning() const { return !run_.get().expired(); }

private:
    friend class VRXScheduler;
    platform::Property<std::weak_ptr<void>> run_;  // owned by the handler that returns the result
};

}  // namespace vrx
