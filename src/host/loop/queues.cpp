#include "vrx/host/loop/queues.h"

#include <pthread.h>

#include <algorithm>
#include <system_error>

#include "vrx/host/base/requester.h"
#include "vrx/platform/log.h"

namespace vrx::host {

using platform::Duration;
using platform::Priority;
using platform::Task;

thread_local WorkerPool* WorkerPool::ofThisThread_ = nullptr;

WorkerPool::WorkerPool(std::size_t size, Duration surplusIdleTime)
    : size_(std::max<std::size_t>(size, 2)), surplusIdleTime_(surplusIdleTime) {}

WorkerPool::~WorkerPool() {
    stop();
}

void WorkerPool::stop() {
    platform::ShutdownScope shutdown;
    std::array<std::deque<Task>, 2> discarded;
    std::unique_lock lock(mutex_);
    isStopping_ = true;
    discarded.swap(tasks_);
    hasWork_.notify_all();
    hasEnded_.wait(lock, [this] { return threads_.empty(); });
    if (ended_.joinable()) ended_.join();
}

void WorkerPool::post(Priority priority, Task task) {
    std::unique_lock lock(mutex_);
    if (isStopping_) {
        lock.unlock();
        platform::ShutdownScope shutdown;
        task = nullptr;
        return;
    }
    tasks_[static_cast<std::size_t>(priority)].push_back(forCurrentRequester(std::move(task)));
    if (idle_ > 0) hasWork_.notify_one();
    addThreadIfNeeded();
}

std::size_t WorkerPool::threadCount() const {
    std::lock_guard lock(mutex_);
    return threads_.size();
}

// A notified thread counts as idle until it runs: hence the comparison of idle threads with all pending tasks.
void WorkerPool::addThreadIfNeeded() {
    if (isStopping_ || pending() <= idle_ || active() >= size_) return;
    try {
        std::thread thread([this] { work(); });  // begins once it gets the lock
        const std::thread::id id = thread.get_id();
        threads_.emplace(id, std::move(thread));
    } catch (const std::system_error& error) {
        // The work waits until another thread is free.
        log(platform::Level::Error, "Cannot add a worker thread: %@", error.what());
    }
}

void WorkerPool::work() {
    pthread_setname_np(pthread_self(), "worker");
    ofThisThread_ = this;
    std::unique_lock lock(mutex_);
    Task task;
    while (takeTask(lock, task)) {
        lock.unlock();
        task();
        task = nullptr;
        lock.lock();
    }
    // This thread is joined by the next one that ends, or by stop().
    auto own = threads_.find(std::this_thread::get_id());
    std::thread previous = std::exchange(ended_, std::move(own->second));
    threads_.erase(own);
    hasEnded_.notify_all();
    lock.unlock();
    if (previous.joinable()) previous.join();
}

// Takes the next task, user-initiated ones first, and waits for one if need be. Returns false when the thread is to
// end.
bool WorkerPool::takeTask(std::unique_lock<std::mutex>& lock, Task& task) {
    bool wasLongIdle = false;
    while (!isStopping_) {
        if (pending() > 0) {
            auto& queue = tasks_[static_cast<std::size_t>(Priority::UserInitiated)].empty()
                              ? tasks_[static_cast<std::size_t>(Priority::Background)]
                              : tasks_[static_cast<std::size_t>(Priority::UserInitiated)];
            task = std::move(queue.front());
            queue.pop_front();
            return true;
        }
        // After waits for events have ended there can be more active threads than the pool's size.
        const bool isSurplus = active() > size_;
        if (isSurplus && wasLongIdle) return false;
        ++idle_;
        if (isSurplus)
            wasLongIdle = hasWork_.wait_for(lock, surplusIdleTime_) == std::cv_status::timeout;
        else
            hasWork_.wait(lock);
        --idle_;
    }
    return false;
}

WorkerPool::WaitingScope::WaitingScope() : pool_(ofThisThread_) {
    if (!pool_) return;
    std::lock_guard lock(pool_->mutex_);
    ++pool_->waiting_;
    pool_->addThreadIfNeeded();
}

WorkerPool::WaitingScope::~WaitingScope() {
    if (!pool_) return;
    std::lock_guard lock(pool_->mutex_);
    --pool_->waiting_;
}

namespace {

// Runs one task at a time, in the order of posting, on whatever worker is free.
class SerialQueue final : public platform::Queue, public std::enable_shared_from_this<SerialQueue> {
public:
    // One that is held keeps its tasks until it is released.
    SerialQueue(std::weak_ptr<WorkerPool> pool, MainLoop& mainLoop, std::string label, bool isHeld = false)
        : pool_(std::move(pool)), mainLoop_(mainLoop), label_(std::move(label)), isRunning_(isHeld) {}
    ~SerialQueue() override {
        platform::ShutdownScope shutdown;
        tasks_.clear();
    }

    void post(Task task) override {
        {
            std::lock_guard lock(mutex_);
            tasks_.push_back(forCurrentRequester(std::move(task)));
            if (std::exchange(isRunning_, true)) return;
        }
        schedule();
    }

    void postAfter(Duration delay, Task task) override {
        mainLoop_.postAfter(delay, shared_from_this(), std::move(task));
    }
    void postAfterWhile(std::weak_ptr<const void> owner, Duration delay, Task task) override {
        mainLoop_.postAfter(delay, shared_from_this(), std::move(task), std::move(owner));
    }
    void release() { schedule(); }

private:
    // The queue's turn on a worker. One that a stopping pool discards destroys the queue's tasks, which may own the
    // queue.
    class Turn {
    public:
        explicit Turn(std::shared_ptr<SerialQueue> queue) : queue_(std::move(queue)) {}
        Turn(Turn&&) noexcept = default;
        ~Turn() {
            if (queue_) queue_->discardAll();
        }
        void operator()() { std::exchange(queue_, nullptr)->runAll(); }

    private:
        std::shared_ptr<SerialQueue> queue_;
    };

    void schedule() {
        const RequesterScope scope(std::nullopt);  // each task of the turn has its own
        Turn turn(shared_from_this());
        if (std::shared_ptr<WorkerPool> pool = pool_.lock()) pool->post(Priority::UserInitiated, std::move(turn));
    }

    void discardAll() {
        platform::ShutdownScope shutdown;
        std::deque<Task> discarded;  // destroyed outside the lock: a task's destruction may post here
        std::lock_guard lock(mutex_);
        discarded.swap(tasks_);
        isRunning_ = false;
        if (!discarded.empty())
            log(platform::Level::Default, "Tasks of the queue %@ that the end leaves undone: %lu", label_,
                discarded.size());
    }

    void runAll() {
        while (true) {
            Task task;
            {
                std::lock_guard lock(mutex_);
                if (tasks_.empty()) {
                    isRunning_ = false;
                    return;
                }
                task = std::move(tasks_.front());
                tasks_.pop_front();
            }
            task();
        }
    }

    const std::weak_ptr<WorkerPool> pool_;
    MainLoop& mainLoop_;
    const std::string label_;
    std::mutex mutex_;
    std::deque<Task> tasks_;
    bool isRunning_;  // or held
};

class Event final : public platform::Event {
public:
    void set() override {
        std::lock_guard lock(mutex_);
        isSet_ = true;
        // Under the lock: the waiting thread may destroy the event as soon as it wakes.
        changed_.notify_all();
    }

    void wait() override {
        std::unique_lock lock(mutex_);
        if (isSet_) return;
        lock.unlock();
        WorkerPool::WaitingScope waiting;
        lock.lock();
        changed_.wait(lock, [this] { return isSet_; });
        lock.unlock();
    }

    bool waitFor(Duration limit) override {
        // A longer time would overflow the clock.
        constexpr Duration longest = std::chrono::hours(24 * 365);
        std::unique_lock lock(mutex_);
        if (isSet_) return true;
        lock.unlock();
        WorkerPool::WaitingScope waiting;
        lock.lock();
        bool wasSet = changed_.wait_for(lock, std::min(limit, longest), [this] { return isSet_; });
        lock.unlock();
        return wasSet;
    }

private:
    std::mutex mutex_;
    std::condition_variable changed_;
    bool isSet_ = false;
};

std::shared_ptr<platform::Queue> makeHeldQueue(const std::shared_ptr<WorkerPool>& pool, MainLoop& mainLoop) {
    constexpr bool isHeld = true;
    auto queue = std::make_shared<SerialQueue>(pool, mainLoop, "main", isHeld);
    mainLoop.post([held = std::weak_ptr(queue)] {
        if (auto self = held.lock()) self->release();
    });
    return queue;
}

}  // namespace

class Queues::Workers final : public platform::Queue, public std::enable_shared_from_this<Workers> {
public:
    Workers(WorkerPool& pool, MainLoop& mainLoop, Priority priority)
        : pool_(pool), mainLoop_(mainLoop), priority_(priority) {}
    void post(Task task) override { pool_.post(priority_, std::move(task)); }
    void postAfter(Duration delay, Task task) override {
        mainLoop_.postAfter(delay, shared_from_this(), std::move(task));
    }

private:
    WorkerPool& pool_;
    MainLoop& mainLoop_;
    const Priority priority_;
};

Queues::Queues(MainLoop& mainLoop, std::size_t size)
    : mainLoop_(mainLoop),
      pool_(std::make_shared<WorkerPool>(size)),
      workers_{std::make_shared<Workers>(*pool_, mainLoop, Priority::Background),
               std::make_shared<Workers>(*pool_, mainLoop, Priority::UserInitiated)},
      mainQueue_(makeHeldQueue(pool_, mainLoop)) {}

Queues::~Queues() {
    stop();
}

std::shared_ptr<platform::Queue> Queues::makeSerialQueue(std::string label) {
    return std::make_shared<SerialQueue>(pool_, mainLoop_, std::move(label));
}

platform::Queue& Queues::workers(Priority priority) {
    return *workers_[static_cast<std::size_t>(priority)];
}

std::shared_ptr<platform::Event> Queues::makeEvent() {
    return std::make_shared<Event>();
}

}  // namespace vrx::host
