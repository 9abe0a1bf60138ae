// Counts pieces of work that are under way and tells when none is left. Any thread may use it.
#pragma once

#include <memory>
#include <mutex>
#include <utility>
#include <vector>

#include "vrx/platform/queue.h"

namespace vrx::platform {

class CompletionGroup {
public:
    void enter();
    // Each enter is followed by exactly one leave.
    void leave();
    // Posts the task to the queue as soon as the group is empty, which it may be already. Tasks are posted in the order
    // in which they were registered.
    void notify(std::shared_ptr<Queue> queue, Task task);

private:
    std::mutex mutex_;
    int count_ = 0;
    std::vector<std::pair<std::shared_ptr<Queue>, Task>> waiting_;
};

}  // namespace vrx::platform
