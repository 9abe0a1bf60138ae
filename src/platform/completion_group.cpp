#include "vrx/platform/completion_group.h"

#include <cassert>

namespace vrx::platform {

void CompletionGroup::enter() {
    std::lock_guard lock(mutex_);
    ++count_;
}

void CompletionGroup::leave() {
    std::lock_guard lock(mutex_);
    assert(count_ > 0);
    if (--count_ > 0) return;
    // Posted under the lock, so that notifications keep their order across threads. Posting does not run the task.
    for (auto& [queue, task] : waiting_) queue->post(std::move(task));
    waiting_.clear();
}

void CompletionGroup::notify(std::shared_ptr<Queue> queue, Task task) {
    std::lock_guard lock(mutex_);
    if (count_ == 0)
        queue->post(std::move(task));
    else
        waiting_.emplace_back(std::move(queue), std::move(task));
}

}  // namespace vrx::platform
