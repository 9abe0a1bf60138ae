// Runs each task on a thread of its own. Any thread may start one.
#pragma once

#include <condition_variable>
#include <cstddef>
#include <functional>
#include <mutex>

namespace vrx::coverage_server {

class Threads {
public:
    explicit Threads(std::size_t atMost) : atMost_(atMost) {}
    // Waits until every task has ended.
    ~Threads() { wait(); }
    Threads(const Threads&) = delete;
    Threads& operator=(const Threads&) = delete;

    // False when too many are running, or when the system has no thread to give. The task must not throw.
    bool start(std::function<void()> task);
    void wait();

private:
    void end();

    const std::size_t atMost_;
    std::mutex mutex_;
    std::condition_variable isIdle_;
    std::size_t running_ = 0;
};

}  // namespace vrx::coverage_server
