// What a test writer relies on: order, virtual time, tasks that wait.
#include "vrx/sim/host.h"

#include "support/values.h"

namespace vrx::sim {
namespace {

using platform::Priority;
using platform::Task;

class SimQueues : public testing::Test {
protected:
    SimQueues() {
        host.failures.handler = [this](const std::string& text) { failures.push_back(text); };
    }

    // A task that notes its name and the virtual time at which it ran.
    Task noting(std::string name) {
        return [this, name] { note(name); };
    }
    void note(const std::string& name) {
        auto seconds = std::chrono::duration_cast<std::chrono::seconds>(host.clock.elapsed());
        notes.push_back(name + "@" + std::to_string(seconds.count()));
    }

    std::vector<std::string> failures;
    std::vector<std::string> notes;
    Host host;
    platform::Queue& main = host.queues.mainQueue();
    platform::Queue& worker = host.queues.workers(Priority::Background);
    const std::shared_ptr<platform::Event> event = host.queues.makeEvent();
};

TEST_F(SimQueues, RunWhatIsDueInTheOrderOfTimeThenOfPosting) {
    main.postAfter(2s, [&] {
        note("late");
        main.postAfter(5s, noting("delayed by it"));
        main.post(noting("posted by it"));
    });
    worker.postAfter(1s, noting("first of two"));
    main.postAfter(1s, noting("second of two"));
    main.postAfter(-1s, noting("now"));
    main.postAfter(Duration(std::nan("")), noting("no number"));
    main.postAfter(Duration(std::numeric_limits<double>::infinity()), noting("never"));
    worker.post([this] { note(event->waitFor(4s) ? "set" : "no longer waiting"); });
    EXPECT_THAT(notes, IsEmpty()) << "posting runs nothing";
    host.run();
    EXPECT_EQ(host.queues.waitingCount(), 1u);
    EXPECT_THAT(std::exchange(notes, {}), ElementsAre("now@0", "no number@0"));
    host.runFor(1s);
    host.clock.set(Clock::start - 24h);  // which moves no timer
    EXPECT_FALSE(event->waitFor(1s)) << "the body waits, and what is due meanwhile is done";
    EXPECT_THAT(std::exchange(notes, {}), ElementsAre("first of two@1", "second of two@1", "late@2", "posted by it@2"));
    host.runUntil(Clock::start - 24h + 1h);
    EXPECT_THAT(notes, ElementsAre("no longer waiting@4", "delayed by it@7"));
    EXPECT_EQ(host.clock.now(), Clock::start - 24h + 1h);
    EXPECT_EQ(host.queues.pendingCount(), 1u);
}

TEST_F(SimQueues, ReportAWaitThatNothingCanEnd) {
    auto serial = host.queues.makeSerialQueue("stuck");
    serial->post([&] { event->wait(); });
    serial->post([&] { event->set(); });
    event->wait();
    EXPECT_THAT(failures, ElementsAre(AllOf(HasSubstr("nothing is left to set"), HasSubstr("'stuck'"))));
    host.queues.letWaitingTasksGo();
}

TEST_F(SimQueues, ReportATaskThatStillWaitsAtTheEndAndFreeWhatItHolds) {
    auto held = std::make_shared<int>();
    std::weak_ptr<int> watch = held;
    worker.post([this, held = std::move(held)] {
        auto alsoHeld = held;
        event->waitFor(1h);
        ADD_FAILURE() << "the wait of an abandoned task returned";
    });
    host.runFor(1s);
    host.queues.close();
    EXPECT_THAT(failures, ElementsAre(HasSubstr("'background' has been waiting since 2026-01-31 12:00:00")));
    EXPECT_TRUE(watch.expired());
}

TEST_F(SimQueues, DiscardAtTheEndWhatHasNotBegun) {
    platform::OnceCallback<int> callback([](int) {});
    main.post([&, callback = std::move(callback)] { note("never"); });
    auto repost = std::shared_ptr<void>(nullptr, [this](void*) { main.post(noting("posted by a destructor")); });
    main.post([repost = std::move(repost)] {});
    host.queues.close();
    EXPECT_EQ(host.queues.pendingCount(), 0u);
    EXPECT_THAT(notes, IsEmpty());
    EXPECT_THAT(failures, IsEmpty());
}

TEST_F(SimQueues, ReportWorkThatNeverEndsAndATaskThatRunsTheQueuesItself) {
    main.post([&] { host.run(); });
    host.run();
    EXPECT_THAT(failures, ElementsAre("a task on queue 'main' ran the queues"));
    failures.clear();
    std::function<void()> again = [&] {
        if (failures.empty()) main.post(again);
    };
    main.post(again);
    host.run();
    EXPECT_THAT(failures, ElementsAre(HasSubstr("without end")));
}

TEST(SimQueuesDeathTest, AnExceptionMustNotLeaveATask) {
    auto run = [] {
        Host host;
        host.queues.mainQueue().post([] { throw std::runtime_error("thrown by a task"); });
        host.run();
    };
    EXPECT_DEATH(run(), "thrown by a task");
}

}  // namespace
}  // namespace vrx::sim
