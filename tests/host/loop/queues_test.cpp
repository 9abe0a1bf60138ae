#include "vrx/host/loop/queues.h"

#include <csignal>
#include <latch>

#include "host/support.h"
#include "support/eventually.h"
#include "vrx/host/base/requester.h"

namespace vrx::host {
namespace {

using platform::Priority;

class HostQueues : public ::testing::Test {
protected:
    LogRecorder log;
    MainLoop loop;
    Queues queues{loop, 2};
};

TEST(WorkerPool, GivesSurplusThreadsBackAndKeepsItsSize) {
    LogRecorder log;
    WorkerPool pool(2, 1ms);
    std::latch begun(10), release(1), done(1);
    for (int i = 0; i < 10; ++i)
        pool.post(Priority::Background, [&] {
            WorkerPool::WaitingScope waiting;
            begun.count_down();
            release.wait();
        });
    begun.wait();
    EXPECT_GE(pool.threadCount(), 10u);
    release.count_down();
    eventually([&] { return pool.threadCount() <= 2; }, "the end of the surplus threads");
    pool.post(Priority::Background, [&] { done.count_down(); });
    done.wait();
    EXPECT_EQ(pool.threadCount(), 2u);
}

TEST(WorkerPool, TakesUserInitiatedWorkFirstAndDiscardsWhatHasNotBegunAtItsEnd) {
    LogRecorder log;
    std::vector<std::string> order;
    auto dropped = std::make_shared<int>(0);
    {
        WorkerPool pool(2);
        std::latch held(2), go(1), done(2);
        for (int i = 0; i < 2; ++i)
            pool.post(Priority::Background, [&, i] {
                held.count_down();
                if (i == 0) go.wait();
                if (i == 1) done.wait();  // leaves one worker to do all of it, in order
            });
        held.wait();
        pool.post(Priority::Background, [&] { order.push_back("background"), done.count_down(); });
        pool.post(Priority::UserInitiated, [&] { order.push_back("user"), done.count_down(); });
        go.count_down();
        done.wait();
        pool.stop();
        pool.post(Priority::Background, [dropped, once = platform::OnceCallback<>([] {})] { ++*dropped; });
    }
    EXPECT_THAT(order, ::testing::ElementsAre("user", "background"));
    EXPECT_EQ(*dropped, 0);
    EXPECT_EQ(dropped.use_count(), 1);
}

// A task may hold what holds its queue.
TEST_F(HostQueues, ASerialQueueKeepsNothingBeyondTheEndOfTheWorkers) {
    auto held = std::make_shared<int>();
    auto queue = queues.makeSerialQueue("serial");
    queues.stop();
    for (int i = 0; i < 2; ++i) queue->post([queue, held] {});
    queue.reset();
    EXPECT_EQ(held.use_count(), 1);
    EXPECT_THAT(log.lines(), ElementsAre(HasSubstr("queue serial"), HasSubstr("undone: 1")));
}

TEST_F(HostQueues, ReleasesATimersTaskWithItsOwner) {
    auto held = std::make_shared<int>(), owner = std::make_shared<int>(), other = std::make_shared<int>();
    loop.postAfterWhile(owner, 1h, [held] {});
    loop.postAfterWhile(other, 2h, [held] {});
    owner.reset();
    loop.post([&] { loop.stop(); });
    loop.run();
    EXPECT_EQ(held.use_count(), 2) << "one is left";
}

TEST_F(HostQueues, CarryForWhomTheyWork) {
    std::vector<Requester> seen;
    const auto note = [&] { seen.push_back(RequesterScope::current()); };
    {
        const RequesterScope scope(1000);
        const auto serial = queues.makeSerialQueue("serial");
        serial->post([&] {
            note();
            queues.workers(platform::Priority::Background).post([&] {
                note();
                loop.postAfter(1ms, [&] {
                    note();
                    loop.stop();
                });
            });
        });
    }
    loop.run();
    note();
    EXPECT_THAT(seen, ::testing::ElementsAre(1000, 1000, 1000, std::nullopt));
}

TEST_F(HostQueues, SignalsAndStopEndTheLoopAndWhatIsLeftRunsTheNextTime) {
    std::vector<int> order;
    loop.post([&] {
        order.push_back(1);
        loop.stop();
    });
    loop.post([&] { order.push_back(2); });
    loop.run();
    EXPECT_THAT(order, ::testing::ElementsAre(1));
    loop.post([&] { kill(getpid(), SIGTERM); });
    loop.run();
    EXPECT_THAT(order, ::testing::ElementsAre(1, 2));
}

}  // namespace
}  // namespace vrx::host
