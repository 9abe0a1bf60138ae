#include "vrx/sim/queues.h"

#include <algorithm>
#include <cassert>

#include "vrx/platform/text.h"

namespace vrx::sim {

using platform::Duration;
using platform::Task;

namespace {

constexpr Duration forever = Duration::max();
// Work that keeps posting more work without letting time pass counts as a loop.
constexpr int mostWorkAtOneTime = 100'000;

// Thrown to unwind the stack of a task whose wait nobody will end.
struct Abandoned {};

}  // namespace

class Queues::Lane final : public platform::Queue, public std::enable_shared_from_this<Lane> {
public:
    Lane(Queues& queues, std::string label, bool isSerial)
        : label(std::move(label)), isSerial(isSerial), queues_(queues) {}

    void post(Task task) override { postAfter(Duration(0), std::move(task)); }
    void postAfter(Duration delay, Task task) override {
        queues_.add(delay, {shared_from_this(), std::move(task), nullptr, queues_.cause()});
    }

    const std::string label;
    const bool isSerial;
    bool isBusy = false;  // a serial lane with a task under way

private:
    Queues& queues_;
};

class Queues::Event final : public platform::Event, public std::enable_shared_from_this<Event> {
public:
    explicit Event(Queues& queues) : queues_(queues) {}

    void set() override {
        isSet = true;
        for (Strand* strand : std::exchange(waiting, {})) queues_.wake(*strand);
    }
    void wait() override { queues_.wait(*this, std::nullopt); }
    bool waitFor(Duration limit) override { return queues_.wait(*this, limit); }

    bool isSet = false;
    std::vector<Strand*> waiting;

private:
    Queues& queues_;
};

struct Queues::Strand {
    Fiber fiber;
    std::shared_ptr<Lane> lane;  // null while it has no task
    std::optional<Key> wakeUp;   // the pending work that ends its wait
    platform::Date waitingSince{};
    bool isAbandoned = false;
    std::string_view cause;
};

Queues::Queues(Clock& clock, const Failures& failures)
    : clock_(clock),
      failures_(failures),
      main_(std::make_shared<Lane>(*this, "main", true)),
      background_(std::make_shared<Lane>(*this, "background", false)),
      userInitiated_(std::make_shared<Lane>(*this, "userInitiated", false)) {}

Queues::~Queues() {
    close();
}

platform::Queue& Queues::mainQueue() {
    return *main_;
}

std::shared_ptr<platform::Queue> Queues::makeSerialQueue(std::string label) {
    return std::make_shared<Lane>(*this, std::move(label), true);
}

platform::Queue& Queues::workers(platform::Priority priority) {
    return priority == platform::Priority::Background ? *background_ : *userInitiated_;
}

std::shared_ptr<platform::Event> Queues::makeEvent() {
    return std::make_shared<Event>(*this);
}

std::string Queues::currentLabel() const {
    return current_ ? current_->lane->label : std::string();
}

std::string_view& Queues::causeNow() {
    return current_ ? current_->cause : causeOfBody_;
}

std::string_view Queues::causeNow() const {
    return current_ ? current_->cause : causeOfBody_;
}

std::size_t Queues::pendingCount() const {
    return static_cast<std::size_t>(
        std::ranges::count_if(pending_, [](const auto& entry) { return !entry.second.strand; }));
}

std::size_t Queues::waitingCount() const {
    return static_cast<std::size_t>(
        std::ranges::count_if(strands_, [](const auto& strand) { return !strand->fiber.isIdle(); }));
}

Queues::Key Queues::add(Duration delay, Work work) {
    if (isClosed_ && !work.strand) {
        platform::ShutdownScope shutdown;
        work.task = nullptr;
        return {};
    }
    // A delay of NaN, or less than 0, counts as 0.
    Duration due = clock_.elapsed() + (delay > Duration(0) ? delay : Duration(0));
    return pending_.emplace(Key(due, ++lastNumber_), std::move(work)).first->first;
}

void Queues::runWork(Duration until) {
    if (!isInBody("ran the queues")) return;
    isStopped_ = false;
    do {
        while (!isStopped_ && runNext(clock_.elapsed())) {
        }
        if (!isStopped_ && idleHandler_) idleHandler_();
    } while (!isStopped_ && runNext(until));
    if (!isStopped_) clock_.advanceTo(until);
}

bool Queues::runNext(Duration until) {
    for (auto next = pending_.begin(); next != pending_.end() && next->first.first <= until; ++next) {
        bool isBlocked = next->second.lane->isBusy && !next->second.strand;
        if (isBlocked) continue;
        countWork(next->first.first);
        Work work = std::move(next->second);
        pending_.erase(next);
        execute(std::move(work));
        return true;
    }
    return false;
}

void Queues::countWork(Duration due) {
    if (due > clock_.elapsed()) workAtThisTime_ = 0;
    clock_.advanceTo(due);
    if (++workAtThisTime_ <= mostWorkAtOneTime) return;
    workAtThisTime_ = 0;
    failures_.report("work goes on without end and lets no time pass");
}

// Runs a task on an idle strand's stack, or continues a strand, until it suspends or ends. Only an ended one frees its
// lane and its strand.
void Queues::execute(Work work) {
    if (work.strand) {
        current_ = work.strand;
        current_->wakeUp.reset();
        current_->fiber.resume();
    } else {
        if (idle_.empty()) idle_.push_back(strands_.emplace_back(std::make_unique<Strand>()).get());
        current_ = idle_.back();
        idle_.pop_back();
        current_->lane = std::move(work.lane);
        current_->cause = work.cause;
        current_->lane->isBusy = current_->lane->isSerial;
        current_->fiber.start([task = std::move(work.task)]() mutable {
            try {
                std::exchange(task, nullptr)();
            } catch (const Abandoned&) {
            }
        });
    }
    if (current_->fiber.isIdle()) {
        current_->lane->isBusy = false;
        current_->lane.reset();
        idle_.push_back(current_);
    }
    current_ = nullptr;
}

bool Queues::wait(Event& event, std::optional<Duration> limit) {
    if (event.isSet) return true;
    if (limit && !(*limit > Duration(0))) return false;
    if (limit > forever) limit.reset();
    if (!current_) return runUntilSet(event, limit);

    Strand& strand = *current_;
    if (!strand.isAbandoned) {
        std::shared_ptr<Event> kept = event.shared_from_this();  // keeps it alive even if the simulation ends meanwhile
        event.waiting.push_back(&strand);
        if (limit) strand.wakeUp = add(*limit, {strand.lane, nullptr, &strand, {}});
        strand.waitingSince = clock_.now();
        strand.fiber.suspend();
        std::erase(event.waiting, &strand);
    }
    if (strand.isAbandoned && std::uncaught_exceptions() == 0) throw Abandoned();
    return event.isSet;
}

bool Queues::runUntilSet(const Event& event, std::optional<Duration> limit) {
    Duration until = limit ? clock_.elapsed() + *limit : forever;
    while (!event.isSet && runNext(until)) {
    }
    if (limit && !event.isSet) clock_.advanceTo(until);
    if (!limit && !event.isSet)
        failures_.report("the test's body waits for an event that nothing is left to set" + waitingTasks());
    return event.isSet;
}

void Queues::wake(Strand& strand) {
    if (strand.wakeUp) pending_.erase(*strand.wakeUp);
    strand.wakeUp = add(Duration(0), {strand.lane, nullptr, &strand, {}});
}

bool Queues::isInBody(const char* what) const {
    if (current_) failures_.report("a task on queue '" + current_->lane->label + "' " + what);
    return !current_;
}

std::string Queues::waitingTasks() const {
    std::string text;
    for (const auto& strand : strands_)
        if (strand->lane)
            text += "; a task on queue '" + strand->lane->label + "' has been waiting since " +
                    platform::describe(strand->waitingSince);
    return text;
}

void Queues::close() {
    if (isClosed_ || !isInBody("ended the simulation")) return;
    if (waitingCount() > 0 && !areWaitingTasksLetGo_)
        failures_.report("the simulation ended while tasks were waiting" + waitingTasks());
    discardWork();
    isClosed_ = true;
}

void Queues::discardWork() {
    if (!isInBody("discarded the work")) return;
    const bool wasClosed = std::exchange(isClosed_, true);
    platform::ShutdownScope shutdown;
    for (const auto& strand : strands_) {
        if (strand->fiber.isIdle()) continue;
        strand->isAbandoned = true;
        if (strand->wakeUp) pending_.erase(*strand->wakeUp);
        execute({strand->lane, nullptr, strand.get(), {}});
        strand->isAbandoned = false;
    }
    while (!pending_.empty()) pending_.extract(pending_.begin());
    isClosed_ = wasClosed;
}

}  // namespace vrx::sim
