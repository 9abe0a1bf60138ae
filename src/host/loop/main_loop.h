// The event loop of the main thread, on sd-event: the host's own events, and the timers of every queue. Made, run and
// destroyed on the main thread; any thread may call the rest. Sleeps without a time limit while nothing is due. While
// it runs, its thread waits for no lock that another process can hold (lock_wait.h).
#pragma once

#include <csignal>
#include <deque>
#include <map>
#include <memory>
#include <mutex>
#include <optional>

#include "vrx/host/base/descriptor.h"
#include "vrx/host/loop/event_source.h"
#include "vrx/platform/queue.h"

namespace vrx::host {

class MainLoop final : public platform::Queue {
public:
    // Takes over SIGTERM and SIGINT, which stop the loop. Threads made from now on have them blocked.
    MainLoop();
    // Discards tasks that have not run.
    ~MainLoop() override;
    MainLoop(const MainLoop&) = delete;
    MainLoop& operator=(const MainLoop&) = delete;

    // Runs until stop() is called, which may be before run(), or a signal comes. It can be run again.
    void run();
    void stop();
    // Whether a signal has ever stopped it.
    bool wasStoppedBySignal() const { return wasStoppedBySignal_; }

    void post(platform::Task task) override;
    void postAfter(platform::Duration delay, platform::Task task) override;
    void postAfterWhile(std::weak_ptr<const void> owner, platform::Duration delay, platform::Task task) override;
    // Posts the task to another queue after the delay on the boot clock, time asleep included. With an owner, it is
    // dropped once that is gone.
    using Owner = std::optional<std::weak_ptr<const void>>;
    void postAfter(platform::Duration delay, std::shared_ptr<platform::Queue> queue, platform::Task task,
                   Owner owner = std::nullopt);

    // For other sources of events, which belong to the main thread.
    sd_event* event() const { return event_.get(); }

private:
    struct Timer {
        std::shared_ptr<platform::Queue> queue;
        platform::Task task;
        Owner owner;

        bool isVoid() const { return owner && owner->expired(); }
    };

    // SIGTERM and SIGINT, blocked for as long as it lives.
    class BlockedSignals {
    public:
        BlockedSignals();
        ~BlockedSignals();
        BlockedSignals(const BlockedSignals&) = delete;
        BlockedSignals& operator=(const BlockedSignals&) = delete;

    private:
        sigset_t previous_;
    };

    static int onSignal(sd_event_source*, const signalfd_siginfo*, void* self);
    static int onWake(sd_event_source*, int file, unsigned events, void* self);
    static int onTimer(sd_event_source*, std::uint64_t due, void* self);
    void wake();
    void runPosted();
    void postDueTimers();
    void armTimer();

    const BlockedSignals blockedSignals_;
    const EventLoop event_;
    const Descriptor wakeFile_;
    const EventSource sigtermSource_;
    const EventSource sigintSource_;
    const EventSource timerSource_;
    const EventSource wakeSource_;
    bool wasStoppedBySignal_ = false;

    std::mutex mutex_;
    std::deque<platform::Task> posted_;
    std::multimap<std::uint64_t, Timer> timers_;  // by due time in microseconds of the boot clock, first come first
    bool isStopping_ = false;
};

}  // namespace vrx::host
