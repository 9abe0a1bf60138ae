// The queues under virtual time. One thread runs all work in the order in which it is due; work that is due at the same
// time runs in the order in which it was posted. Two runs of the same program do the same in the same order.
//
// Each task has a stack of its own. A task that waits for an event is suspended while other work runs and time passes,
// just as a thread would be. A serial queue whose task waits, the main queue included, starts nothing meanwhile.
//
// The thread that owns the simulation is the test's body. It runs the queues; when it waits for an event itself, they
// run until the event is set.
#pragma once

#include <cstdint>
#include <exception>
#include <functional>
#include <map>
#include <memory>
#include <optional>
#include <set>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "vrx/platform/queue.h"
#include "vrx/sim/clock.h"
#include "vrx/sim/failures.h"
#include "vrx/sim/fiber.h"

namespace vrx::sim {

class Queues final : public platform::Queues {
public:
    Queues(Clock& clock, const Failures& failures);
    ~Queues() override;

    platform::Queue& mainQueue() override;
    std::shared_ptr<platform::Queue> makeSerialQueue(std::string label) override;
    platform::Queue& workers(platform::Priority priority) override;
    std::shared_ptr<platform::Event> makeEvent() override;

    // For the test's body. These run the work that is due now, within a duration, or by a date; then it is that late.
    // stop() makes them return when the task under way has ended or waits, however early it is.
    void run() { runWork(clock_.elapsed()); }
    void runFor(platform::Duration duration) { runWork(clock_.elapsed() + duration); }
    void runUntil(platform::Date date) { runWork(clock_.elapsedAt(date)); }

    // Runs the next piece of work that is due by the date, after which the process may be killed. Returns false when
    // there is none.
    bool runOne(platform::Date until) { return runNext(clock_.elapsedAt(until)); }

    // The label of the queue whose task is running: "main", "background", "userInitiated" or a serial queue's own;
    // empty in the test's body.
    std::string currentLabel() const;
    // What began the work under way, such as an activity or a client's request; empty when nothing is known to have. A
    // task has the cause of the work that posted it. The text lives as long as the queues.
    std::string_view cause() const { return causeNow(); }
    bool isInTask() const { return current_ != nullptr; }
    void stop() { isStopped_ = true; }
    // Tasks that have not begun, delayed ones included.
    std::size_t pendingCount() const;
    // Tasks that wait for an event.
    std::size_t waitingCount() const;

    // The handler is called while the queues are run, between two tasks, when nothing is due now and before time
    // passes.
    void setIdleHandler(std::function<void()> handler) { idleHandler_ = std::move(handler); }
    // Does what the end of a process does to its work: unwinds the stacks of waiting tasks, and discards the tasks that
    // have not begun and those that are posted meanwhile.
    void discardWork();

    // Ends the simulation's work. A task that still waits is a failure, unless letWaitingTasksGo() was called; its wait
    // never returns, and its stack is unwound. Tasks that have not begun, or are posted from now on, are discarded.
    void close();
    // Lets tasks wait when the simulation ends: this test does not care about them.
    void letWaitingTasksGo() { areWaitingTasksLetGo_ = true; }

private:
    class Lane;
    class Event;

    // A task under way.
    struct Strand;

    using Key = std::pair<platform::Duration, std::uint64_t>;  // when it is due, and its number
    // A task that has not begun, or the continuation of one under way.
    struct Work {
        std::shared_ptr<Lane> lane;
        platform::Task task;
        Strand* strand = nullptr;
        std::string_view cause{};
    };

    friend class CauseScope;
    std::string_view& causeNow();
    std::string_view causeNow() const;

    Key add(platform::Duration delay, Work work);
    void runWork(platform::Duration until);
    bool runNext(platform::Duration until);
    void countWork(platform::Duration due);
    void execute(Work work);
    bool wait(Event& event, std::optional<platform::Duration> limit);
    bool runUntilSet(const Event& event, std::optional<platform::Duration> limit);
    void wake(Strand& strand);
    bool isInBody(const char* what) const;
    std::string waitingTasks() const;

    Clock& clock_;
    const Failures& failures_;
    std::map<Key, Work> pending_;
    std::uint64_t lastNumber_ = 0;
    std::vector<std::unique_ptr<Strand>> strands_;
    std::vector<Strand*> idle_;
    Strand* current_ = nullptr;
    int workAtThisTime_ = 0;
    bool isClosed_ = false;
    bool isStopped_ = false;
    bool areWaitingTasksLetGo_ = false;
    std::set<std::string, std::less<>> causes_;  // all that there were
    std::string_view causeOfBody_;
    std::function<void()> idleHandler_;

    std::shared_ptr<Lane> main_;
    std::shared_ptr<Lane> background_;
    std::shared_ptr<Lane> userInitiated_;
};

// While one lives, what its task posts, or the test's body, has this cause.
class CauseScope {
public:
    CauseScope(Queues& queues, std::string_view cause)
        : now_(queues.causeNow()), before_(std::exchange(now_, *queues.causes_.emplace(cause).first)) {}
    ~CauseScope() { now_ = before_; }
    CauseScope(const CauseScope&) = delete;
    CauseScope& operator=(const CauseScope&) = delete;

private:
    std::string_view& now_;
    const std::string_view before_;
};

}  // namespace vrx::sim
