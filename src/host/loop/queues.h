// The host's queues: a pool of workers that carries the parallel and the serial queues, the main queue among them. The
// pool has as many threads as the machine has processors; a worker that waits for an event is replaced by another
// thread for as long as it waits. Any thread may use them. Timers of all queues fire while the main loop runs.
//
// The main queue begins when the main loop first runs, after all start-up. It is not the loop's own thread, so that its
// tasks may wait while the loop goes on accepting clients.
#pragma once

#include <array>
#include <condition_variable>
#include <deque>
#include <map>
#include <memory>
#include <mutex>
#include <thread>

#include "vrx/host/loop/main_loop.h"
#include "vrx/platform/queue.h"

namespace vrx::host {

class WorkerPool {
public:
    // Threads start with the first work. Surplus ones end after the given time without work.
    explicit WorkerPool(std::size_t size, platform::Duration surplusIdleTime = std::chrono::seconds(5));
    // Waits for running tasks; discards those that have not begun.
    ~WorkerPool();
    WorkerPool(const WorkerPool&) = delete;
    WorkerPool& operator=(const WorkerPool&) = delete;

    void post(platform::Priority priority, platform::Task task);
    // Discards tasks that have not begun, also those posted from now on, and waits for running ones.
    void stop();
    std::size_t threadCount() const;

    // While one is alive on a worker's thread, the pool counts the worker as waiting. Elsewhere it does nothing.
    class WaitingScope {
    public:
        WaitingScope();
        ~WaitingScope();
        WaitingScope(const WaitingScope&) = delete;
        WaitingScope& operator=(const WaitingScope&) = delete;

    private:
        WorkerPool* pool_;
    };

private:
    void work();
    bool takeTask(std::unique_lock<std::mutex>& lock, platform::Task& task);
    void addThreadIfNeeded();
    std::size_t pending() const { return tasks_[0].size() + tasks_[1].size(); }
    std::size_t active() const { return threads_.size() - waiting_; }

    static thread_local WorkerPool* ofThisThread_;

    const std::size_t size_;
    const platform::Duration surplusIdleTime_;

    mutable std::mutex mutex_;
    std::condition_variable hasWork_;
    std::condition_variable hasEnded_;
    std::array<std::deque<platform::Task>, 2> tasks_;  // by priority
    std::map<std::thread::id, std::thread> threads_;
    std::thread ended_;  // the thread that ended last, for the next one to join
    std::size_t idle_ = 0;
    std::size_t waiting_ = 0;  // for events
    bool isStopping_ = false;
};

class Queues final : public platform::Queues {
public:
    explicit Queues(MainLoop& mainLoop, std::size_t size = std::thread::hardware_concurrency());
    // Waits for running tasks; discards those that have not begun.
    ~Queues() override;

    platform::Queue& mainQueue() override { return *mainQueue_; }
    std::weak_ptr<platform::Queue> weakMainQueue() const { return mainQueue_; }
    std::shared_ptr<platform::Queue> makeSerialQueue(std::string label) override;
    platform::Queue& workers(platform::Priority priority) override;
    std::shared_ptr<platform::Event> makeEvent() override;

    // Ends the pool's work. To be called before anything that tasks use is destroyed.
    void stop() { pool_->stop(); }

private:
    class Workers;

    MainLoop& mainLoop_;
    std::shared_ptr<WorkerPool> pool_;
    std::array<std::shared_ptr<platform::Queue>, 2> workers_;
    const std::shared_ptr<platform::Queue> mainQueue_;
};

}  // namespace vrx::host
