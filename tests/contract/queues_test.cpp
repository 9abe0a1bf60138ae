// What the queues of every host do, simulated or real. The real ones run on threads; nothing here waits for time to
// pass but for the shortest of timers.
#include "vrx/platform/queue.h"

#include <gmock/gmock.h>

#include <chrono>
#include <mutex>

#include "host/support.h"
#include "vrx/host/loop/queues.h"
#include "vrx/sim/host.h"

namespace vrx {
namespace {

using namespace std::chrono_literals;
using platform::Duration;
using platform::Event;
using platform::Priority;
using testing::ElementsAre;

class SimulatedQueues {
public:
    platform::Queues& queues() { return host_.queues; }
    Duration time() const { return host_.clock.elapsed(); }
    // Lets all queues run until the event is set.
    void runUntil(const std::shared_ptr<Event>& event) { event->wait(); }

private:
    sim::Host host_;
};

class RealQueues {
public:
    platform::Queues& queues() { return queues_; }
    Duration time() const { return std::chrono::steady_clock::now().time_since_epoch(); }
    void runUntil(const std::shared_ptr<Event>& event) {
        queues_.workers(Priority::UserInitiated).post([this, event] {
            event->wait();
            loop_.stop();
        });
        loop_.run();
    }

private:
    host::LogRecorder log_;
    host::MainLoop loop_;
    host::Queues queues_{loop_, 2};
};

template <class Subject>
class QueuesContract : public testing::Test {
protected:
    void note(const char* text) {
        std::lock_guard lock(mutex);
        notes.push_back(text);
    }

    std::mutex mutex;
    std::vector<std::string> notes;
    Subject subject;
    platform::Queues& queues = subject.queues();
    platform::Queue& worker = queues.workers(Priority::Background);
    std::shared_ptr<Event> done = queues.makeEvent();
};

struct Names {
    template <class Subject>
    static std::string GetName(int) {
        return std::is_same_v<Subject, SimulatedQueues> ? "Simulated" : "Real";
    }
};
using Subjects = testing::Types<SimulatedQueues, RealQueues>;
TYPED_TEST_SUITE(QueuesContract, Subjects, Names);

TYPED_TEST(QueuesContract, RunASerialQueuesTasksInTheirOrderAndOneAtATime) {
    for (platform::Queue* queue : {&this->queues.mainQueue(), this->queues.makeSerialQueue("serial").get()}) {
        auto serial = this->queues.makeSerialQueue("serial");
        auto finished = this->queues.makeEvent();
        if (queue != &this->queues.mainQueue()) queue = serial.get();
        this->notes.clear();
        queue->post([&, queue] {
            queue->post([&] { this->note("posted by the first"); });
            queue->postAfter(-1s, [&, finished] {
                this->note("after no time");
                finished->set();
            });
            this->note("first");
        });
        this->subject.runUntil(finished);
        EXPECT_THAT(this->notes, ElementsAre("first", "posted by the first", "after no time"));
    }
}

TYPED_TEST(QueuesContract, KeepASerialQueueBusyWhileItsTaskWaits) {
    auto serial = this->queues.makeSerialQueue("serial");
    auto event = this->queues.makeEvent();
    serial->post([&, event] {
        this->note("begins");
        this->worker.post([&, event] {
            this->note("other work");
            event->set();
        });
        event->wait();
        this->note("ends");
    });
    serial->post([&] {
        this->note("next");
        this->done->set();
    });
    this->subject.runUntil(this->done);
    EXPECT_THAT(this->notes, ElementsAre("begins", "other work", "ends", "next"));
}

TYPED_TEST(QueuesContract, RunWorkersSideBySideHoweverManyWait) {
    constexpr int count = 20;
    std::vector<std::shared_ptr<Event>> events;
    for (int i = 0; i <= count; ++i) events.push_back(this->queues.makeEvent());
    // Each waits for the one that is posted after it.
    for (int i = 0; i < count; ++i)
        this->queues.workers(i % 2 ? Priority::Background : Priority::UserInitiated).post([&, i] {
            auto index = static_cast<std::size_t>(i);
            events[index + 1]->wait();
            events[index]->set();
        });
    this->worker.post([&] { events.back()->set(); });
    this->subject.runUntil(events.front());
}

TYPED_TEST(QueuesContract, RunDelayedTasksInTheirOrderAndNeverEarly) {
    auto serial = this->queues.makeSerialQueue("serial");
    const Duration begin = this->subject.time();
    Duration took{};
    serial->postAfter(20ms, [&] {
        took = this->subject.time() - begin;
        this->note("late");
        this->done->set();
    });
    serial->postAfter(10ms, [&] { this->note("early"); });
    serial->postAfter(Duration(std::numeric_limits<double>::infinity()), [&] { this->note("never"); });
    this->subject.runUntil(this->done);
    EXPECT_THAT(this->notes, ElementsAre("early", "late"));
    EXPECT_GE(took, 20ms);
}

TYPED_TEST(QueuesContract, KeepAnEventSetAndLimitAWait) {
    this->worker.post([&] {
        auto event = this->queues.makeEvent();
        EXPECT_FALSE(event->waitFor(-1s));
        const Duration begin = this->subject.time();
        EXPECT_FALSE(event->waitFor(10ms));
        EXPECT_GE(this->subject.time() - begin, 10ms);
        event->set();
        event->set();
        EXPECT_TRUE(event->waitFor(0s));
        event->wait();

        auto later = this->queues.makeEvent();
        this->worker.post([later] { later->set(); });
        EXPECT_TRUE(later->waitFor(1h));
        this->done->set();
    });
    this->subject.runUntil(this->done);
}

TYPED_TEST(QueuesContract, LetPostedWorkOutliveItsQueueAndFreeItWhenRun) {
    auto held = std::make_shared<int>();
    std::weak_ptr<int> watch = held;
    auto freed = this->queues.makeEvent();
    bool hasRun = false;
    this->queues.makeSerialQueue("forgotten")
        ->post([&hasRun, held = std::shared_ptr<int>(held.get(), [held, freed](int*) mutable {
                             held.reset();
                             freed->set();
                         })] { hasRun = true; });
    held.reset();
    this->subject.runUntil(freed);
    EXPECT_TRUE(hasRun);
    EXPECT_TRUE(watch.expired());
}

}  // namespace
}  // namespace vrx
