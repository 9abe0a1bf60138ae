#include "coverage_server/threads.h"

#include <system_error>
#include <thread>

namespace vrx::coverage_server {

bool Threads::start(std::function<void()> task) {
    std::lock_guard lock(mutex_);
    if (running_ == atMost_) return false;
    try {
        std::thread([this, task = std::move(task)] {
            task();
            end();
        }).detach();
    } catch (const std::system_error&) {
        return false;
    }
    ++running_;
    return true;
}

void Threads::wait() {
    std::unique_lock lock(mutex_);
    isIdle_.wait(lock, [this] { return running_ == 0; });
}

void Threads::end() {
    std::lock_guard lock(mutex_);
    if (--running_ == 0) isIdle_.notify_all();
}

}  // namespace vrx::coverage_server
