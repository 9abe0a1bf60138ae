// A recursive lock that those who wait get in the order of their coming. A plain one goes to whoever happens to run
// when it is free: with many threads that look again and again, some of them wait a hundred times as long as others.
#pragma once

#include <condition_variable>
#include <deque>
#include <mutex>
#include <thread>

namespace vrx {

// Any thread; for std::unique_lock.
class TurnLock {
public:
    void lock() {
        const auto self = std::this_thread::get_id();
        std::unique_lock guard(mutex_);
        if (owner_ != std::thread::id() && owner_ != self) {
            Turn turn{self};
            waiting_.push_back(&turn);
            turn.hasCome.wait(guard, [&] { return owner_ == self; });
        }
        owner_ = self;
        ++depth_;
    }

    void unlock() {
        const std::lock_guard guard(mutex_);
        if (--depth_ > 0) return;
        owner_ = {};
        if (waiting_.empty()) return;
        owner_ = waiting_.front()->thread;
        waiting_.front()->hasCome.notify_one();
        waiting_.pop_front();
    }

private:
    struct Turn {
        const std::thread::id thread;
        std::condition_variable hasCome{};
    };

    std::mutex mutex_;
    std::thread::id owner_;  // from the moment that it is its turn
    int depth_ = 0;          // how often the owner has taken it
    std::deque<Turn*> waiting_;
};

}  // namespace vrx
