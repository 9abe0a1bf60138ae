// The threads on which replies come. They are made when they are needed, up to a number, and kept. Any thread may post.
#pragma once

#include <condition_variable>
#include <deque>
#include <mutex>
#include <thread>
#include <vector>

#include "vrx/platform/task.h"

namespace vrx::client {

class Workers {
public:
    explicit Workers(std::size_t most) : most_(most) {}
    // Waits until everything that was posted has run.
    ~Workers();
    Workers(const Workers&) = delete;
    Workers& operator=(const Workers&) = delete;

    void post(platform::Task task);

private:
    void run();

    const std::size_t most_;
    std::mutex mutex_;
    std::condition_variable hasWork_;
    std::deque<platform::Task> tasks_;
    std::size_t idle_ = 0;
    bool isEnding_ = false;
    std::vector<std::thread> threads_;
};

}  // namespace vrx::client
