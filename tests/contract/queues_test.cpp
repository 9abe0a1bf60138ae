// What the queues of every host do, simulated or real. The real ones run on threads; nothing here waits for time to
// pass but for the shortest of timers.
#include "vrx/platform/queue.h"

#include <algorithm>
#include <chrono>
#include <limits>

#include "contract/hosts.h"

namespace vrx {
namespace {

using platform::Event;
using platform::Priority;

template <class Host>
class QueuesContract : public ContractTest<Host> {
protected:
    void note(const char* text) {
        std::lock_guard lock(mutex);
        notes.push_back(text);
    }

    std::mutex mutex;
    std::vector<std::string> notes;
    platform::Queues& queues = this->host.queues();
    const std::shared_ptr<platform::Queue> serial = queues.makeSerialQueue("serial");
    platform::Queue& worker = queues.workers(Priority::Background);
    std::shared_ptr<Event> done = queues.makeEvent();
};

TYPED_TEST_SUITE(QueuesContract, Hosts, HostNames);

TYPED_TEST(QueuesContract, RunASerialQueuesTasksInTheirOrderAndOneAtATime) {
    for (platform::Queue* queue : {&this->queues.mainQueue(), this->serial.get()}) {
        auto finished = this->queues.makeEvent();
        this->notes.clear();
        queue->post([&, queue] {
            queue->post([&] { this->note("posted by the first"); });
            queue->postAfter(-1s, [&, finished] {
                this->note("after no time");
                finished->set();
            });
            this->note("first");
        });
        this->host.runUntil(finished);
        EXPECT_THAT(this->notes, ElementsAre("first", "posted by the first", "after no time"));
    }
}

TYPED_TEST(QueuesContract, KeepASerialQueueBusyWhileItsTaskWaits) {
    auto event = this->queues.makeEvent();
    this->serial->post([&, event] {
        this->note("begins");
        this->worker.post([&, event] {
            this->note("other work");
            event->set();
        });
        event->wait();
        this->note("ends");
    });
    this->serial->post([&] {
        this->note("next");
        this->done->set();
    });
    this->host.runUntil(this->done);
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
    this->worker.post([&] {
        auto inner = this->queues.makeEvent();
        this->serial->post([inner] { inner->set(); });
        inner->wait();
        events.back()->set();
    });
    this->host.runUntil(events.front());
}

TYPED_TEST(QueuesContract, RunDelayedTasksInTheirOrderAndNeverEarly) {
    for (platform::Queue* queue : {&this->queues.mainQueue(), this->serial.get()}) {
        auto finished = this->queues.makeEvent();
        this->notes.clear();
        const Duration begin = this->host.time();
        Duration took{};
        queue->postAfter(20ms, [&, finished] {
            took = this->host.time() - begin;
            this->note("late");
            finished->set();
        });
        queue->postAfter(10ms, [&] { this->note("early"); });
        for (double never : {1e300, std::numeric_limits<double>::infinity()})
            queue->postAfter(Duration(never), [&] { this->note("never"); });
        this->host.runUntil(finished);
        EXPECT_THAT(this->notes, ElementsAre("early", "late"));
        EXPECT_GE(took, 20ms);
    }
    this->worker.postAfter(1ms, [&] { this->done->set(); });
    this->host.runUntil(this->done);
}

TYPED_TEST(QueuesContract, KeepAnEventSetAndLimitAWait) {
    this->worker.post([&] {
        auto event = this->queues.makeEvent();
        EXPECT_FALSE(event->waitFor(-1s));
        const Duration begin = this->host.time();
        EXPECT_FALSE(event->waitFor(10ms));
        EXPECT_GE(this->host.time() - begin, 10ms);
        event->set();
        event->set();
        EXPECT_TRUE(event->waitFor(0s));
        event->wait();

        auto later = this->queues.makeEvent();
        this->worker.post([later] { later->set(); });
        EXPECT_TRUE(later->waitFor(1h));
        this->done->set();
    });
    this->host.runUntil(this->done);
}

TYPED_TEST(QueuesContract, LetPostedWorkOutliveItsQueueInOrderAndFreeItWhenRun) {
    static constexpr int count = 2000;
    auto held = std::make_shared<int>();
    std::weak_ptr<int> watch = held;
    auto freed = this->queues.makeEvent();
    std::vector<int> order;
    {
        auto forgotten = this->queues.makeSerialQueue("forgotten");
        for (int i = 0; i < count; ++i) forgotten->post([&order, i] { order.push_back(i); });
        forgotten->post([&order, held = std::shared_ptr<int>(held.get(), [held, freed](int*) mutable {
                                     held.reset();
                                     freed->set();
                                 })] { order.push_back(count); });
    }
    held.reset();
    this->host.runUntil(freed);
    EXPECT_EQ(order.size(), count + 1u);
    EXPECT_TRUE(std::ranges::is_sorted(order));
    EXPECT_TRUE(watch.expired());
}

}  // namespace
}  // namespace vrx
