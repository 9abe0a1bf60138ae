#include "vrx/client/workers.h"

namespace vrx::client {

using platform::Task;

Workers::~Workers() {
    {
        std::lock_guard lock(mutex_);
        isEnding_ = true;
    }
    hasWork_.notify_all();
    for (std::thread& thread : threads_) thread.join();
}

void Workers::post(Task task) {
    {
        std::lock_guard lock(mutex_);
        tasks_.push_back(std::move(task));
        if (tasks_.size() > idle_ && threads_.size() < most_) threads_.emplace_back([this] { run(); });
    }
    hasWork_.notify_one();
}

void Workers::run() {
    std::unique_lock lock(mutex_);
    while (true) {
        ++idle_;
        hasWork_.wait(lock, [this] { return isEnding_ || !tasks_.empty(); });
        --idle_;
        if (tasks_.empty()) return;
        Task task = std::move(tasks_.front());
        tasks_.pop_front();
        lock.unlock();
        task();
        task = nullptr;
        lock.lock();
    }
}

}  // namespace vrx::client
