#include "vrx/host/loop/main_loop.h"

#include <sys/eventfd.h>

#include <algorithm>
#include <ctime>
#include <iterator>
#include <list>

#include "vrx/host/base/lock_wait.h"
#include "vrx/host/base/requester.h"

namespace vrx::host {

using platform::Duration;
using platform::Task;

namespace {

std::uint64_t bootMicroseconds() {
    timespec now{};
    clock_gettime(CLOCK_BOOTTIME, &now);
    return static_cast<std::uint64_t>(now.tv_sec) * 1'000'000 + static_cast<std::uint64_t>(now.tv_nsec) / 1'000;
}

// Now plus the delay, rounded up; a century at most.
std::uint64_t dueTime(Duration delay) {
    constexpr double century = 100.0 * 366 * 86400;
    double seconds = delay.count() < century ? delay.count() : century;
    return bootMicroseconds() + static_cast<std::uint64_t>(seconds * 1e6) + 1;
}

}  // namespace

MainLoop::BlockedSignals::BlockedSignals() {
    sigset_t stopping;
    sigemptyset(&stopping);
    sigaddset(&stopping, SIGTERM);
    sigaddset(&stopping, SIGINT);
    pthread_sigmask(SIG_BLOCK, &stopping, &previous_);
}

MainLoop::BlockedSignals::~BlockedSignals() {
    pthread_sigmask(SIG_SETMASK, &previous_, nullptr);
}

MainLoop::MainLoop()
    : event_(makeEventLoop()),
      wakeFile_(makeEventFile()),
      sigtermSource_(addSignalSource(event_.get(), SIGTERM, onSignal, this)),
      sigintSource_(addSignalSource(event_.get(), SIGINT, onSignal, this)),
      timerSource_(addBootTimer(event_.get(), onTimer, this)),
      wakeSource_(addReadSource(event_.get(), wakeFile_.number(), onWake, this)) {
    LockWait::setEnding(false);
}

MainLoop::~MainLoop() {
    // Repeats, because destroying a task may post another.
    platform::ShutdownScope shutdown;
    while (true) {
        std::deque<Task> posted;
        std::multimap<std::uint64_t, Timer> timers;
        std::lock_guard lock(mutex_);
        posted.swap(posted_);
        timers.swap(timers_);
        if (posted.empty() && timers.empty()) break;
    }
}

void MainLoop::run() {
    const LockWait::Forbidden forbidden;
    while (true) {
        {
            std::lock_guard lock(mutex_);
            if (std::exchange(isStopping_, false)) return;
        }
        checkEventCall(sd_event_run(event_.get(), UINT64_MAX), "event loop");
    }
}

void MainLoop::stop() {
    {
        std::lock_guard lock(mutex_);
        isStopping_ = true;
    }
    wake();
}

void MainLoop::post(Task task) {
    {
        std::lock_guard lock(mutex_);
        posted_.push_back(forCurrentRequester(std::move(task)));
    }
    wake();
}

void MainLoop::postAfter(Duration delay, Task task) {
    postAfter(delay, nullptr, std::move(task));
}

void MainLoop::postAfterWhile(std::weak_ptr<const void> owner, Duration delay, Task task) {
    postAfter(delay, nullptr, std::move(task), std::move(owner));
}

void MainLoop::postAfter(Duration delay, std::shared_ptr<Queue> queue, Task task, Owner owner) {
    if (!(delay.count() > 0)) return queue ? queue->post(std::move(task)) : post(std::move(task));
    Timer timer{std::move(queue), forCurrentRequester(std::move(task)), std::move(owner)};
    bool isFirst;
    {
        std::lock_guard lock(mutex_);
        auto position = timers_.emplace(dueTime(delay), std::move(timer));
        isFirst = position == timers_.begin();
    }
    if (isFirst) wake();
}

void MainLoop::wake() {
    // It can only fail when the counter is full, and then the loop is awake.
    [[maybe_unused]] int result = eventfd_write(wakeFile_.number(), 1);
}

int MainLoop::onSignal(sd_event_source*, const signalfd_siginfo*, void* self) {
    static_cast<MainLoop*>(self)->wasStoppedBySignal_ = true;
    LockWait::setEnding(true);
    static_cast<MainLoop*>(self)->stop();
    return 0;
}

int MainLoop::onWake(sd_event_source*, int file, unsigned, void* self) {
    eventfd_t count;
    eventfd_read(file, &count);
    static_cast<MainLoop*>(self)->armTimer();
    static_cast<MainLoop*>(self)->runPosted();
    return 0;
}

int MainLoop::onTimer(sd_event_source*, std::uint64_t, void* self) {
    static_cast<MainLoop*>(self)->postDueTimers();
    static_cast<MainLoop*>(self)->armTimer();
    return 0;
}

// Runs only what has been posted so far. What these tasks post runs in the next round, after other events.
void MainLoop::runPosted() {
    std::deque<Task> tasks;
    std::unique_lock lock(mutex_);
    tasks.swap(posted_);
    while (!tasks.empty() && !isStopping_) {
        lock.unlock();
        tasks.front()();
        tasks.pop_front();
        lock.lock();
    }
    if (tasks.empty()) return;
    // Stopped: the rest keeps its place, in case the loop is run again.
    std::move(tasks.rbegin(), tasks.rend(), std::front_inserter(posted_));
    wake();
}

void MainLoop::postDueTimers() {
    const std::uint64_t now = bootMicroseconds();
    while (true) {
        Timer timer;
        {
            std::lock_guard lock(mutex_);
            auto first = timers_.begin();
            if (first == timers_.end() || first->first > now) return;
            timer = std::move(first->second);
            timers_.erase(first);
        }
        timer.queue ? timer.queue->post(std::move(timer.task)) : post(std::move(timer.task));
    }
}

void MainLoop::armTimer() {
    std::list<Timer> removed;  // destroyed outside the lock
    std::unique_lock lock(mutex_);
    while (!timers_.empty() && timers_.begin()->second.isVoid()) {
        removed.push_back(std::move(timers_.begin()->second));
        timers_.erase(timers_.begin());
    }
    const bool isNeeded = !timers_.empty();
    const std::uint64_t due = isNeeded ? timers_.begin()->first : 0;
    lock.unlock();
    if (isNeeded) checkEventCall(sd_event_source_set_time(timerSource_.get(), due), "timer");
    checkEventCall(sd_event_source_set_enabled(timerSource_.get(), isNeeded ? SD_EVENT_ONESHOT : SD_EVENT_OFF),
                   "timer");
}

}  // namespace vrx::host
