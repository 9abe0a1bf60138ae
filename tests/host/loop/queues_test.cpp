#include "vrx/host/loop/queues.h"

#include <gmock/gmock.h>

#include <atomic>
#include <csignal>
#include <future>
#include <latch>

#include "host/support.h"

namespace vrx::host {
namespace {

using namespace std::chrono_literals;
using platform::Priority;

class HostQueues : public ::testing::Test {
protected:
    LogRecorder log;
    MainLoop loop;
    Queues queues{loop, 2};
};

TEST_F(HostQueues, WaitingWorkersStarveNobody) {
    constexpr int waiting = 20;
    auto release = queues.makeEvent();
    std::latch begun(waiting), ended(waiting);
    for (int i = 0; i < waiting; ++i) {
        queues.workers(Priority::Background).post([&] {
            begun.count_down();
            release->wait();
            ended.count_down();
        });
    }
    begun.wait();
    // On the pool too, and itself waiting for another task of the pool.
    auto answered = queues.makeEvent();
    queues.workers(Priority::UserInitiated).post([&] {
        auto inner = queues.makeEvent();
        queues.makeSerialQueue("inner")->post([inner] { inner->set(); });
        inner->wait();
        answered->set();
    });
    answered->wait();
    release->set();
    ended.wait();
}

TEST(WorkerPool, GivesSurplusThreadsBackAndKeepsItsSize) {
    LogRecorder log;
    WorkerPool pool(2, 1ms);
    std::latch begun(10);
    std::promise<void> release;
    std::shared_future<void> released = release.get_future().share();
    for (int i = 0; i < 10; ++i) {
        pool.post(Priority::Background, [&] {
            WorkerPool::WaitingScope waiting;
            begun.count_down();
            released.wait();
        });
    }
    begun.wait();
    EXPECT_GE(pool.threadCount(), 10u);
    release.set_value();
    while (pool.threadCount() > 2) std::this_thread::yield();
    std::promise<void> done;
    pool.post(Priority::Background, [&] { done.set_value(); });
    done.get_future().wait();
    EXPECT_EQ(pool.threadCount(), 2u);
}

TEST(WorkerPool, TakesUserInitiatedWorkFirstAndDiscardsWhatHasNotBegunAtItsEnd) {
    LogRecorder log;
    std::vector<std::string> order;
    auto dropped = std::make_shared<int>(0);
    {
        WorkerPool pool(2);
        std::promise<void> go;
        std::shared_future<void> gone = go.get_future().share();
        std::latch held(2), done(2);
        for (int i = 0; i < 2; ++i) {
            pool.post(Priority::Background, [&, i] {
                held.count_down();
                if (i == 0) gone.wait();
                if (i == 1) done.wait();  // leaves one worker to do all of it, in order
            });
        }
        held.wait();
        pool.post(Priority::Background, [&] { order.push_back("background"), done.count_down(); });
        pool.post(Priority::UserInitiated, [&] { order.push_back("user"), done.count_down(); });
        go.set_value();
        done.wait();
        pool.stop();
        pool.post(Priority::Background, [dropped, once = platform::OnceCallback<>([] {})] { ++*dropped; });
    }
    EXPECT_THAT(order, ::testing::ElementsAre("user", "background"));
    EXPECT_EQ(*dropped, 0);
    EXPECT_EQ(dropped.use_count(), 1);
}

TEST_F(HostQueues, ASerialQueueRunsInOrderAndOneAtATimeAndLivesUntilItsWorkIsDone) {
    constexpr int count = 2000;
    std::vector<int> order;
    auto done = queues.makeEvent();
    {
        auto serial = queues.makeSerialQueue("test");
        for (int i = 0; i < count; ++i) serial->post([&order, i] { order.push_back(i); });
        serial->post([done] { done->set(); });
    }
    done->wait();
    ASSERT_EQ(order.size(), std::size_t{count});
    EXPECT_TRUE(std::is_sorted(order.begin(), order.end()));
}

// A task may hold what holds its queue.
TEST_F(HostQueues, ASerialQueueKeepsNothingBeyondTheEndOfTheWorkers) {
    auto held = std::make_shared<int>();
    auto queue = queues.makeSerialQueue("serial");
    queues.stop();
    for (int i = 0; i < 2; ++i) queue->post([queue, held] {});
    queue.reset();
    EXPECT_EQ(held.use_count(), 1);
}

TEST_F(HostQueues, TheMainQueueRunsPostsInOrderAndTimersByTheirTimeNeverEarly) {
    std::vector<std::string> order;
    const auto begin = std::chrono::steady_clock::now();
    std::chrono::steady_clock::duration took{};
    loop.postAfter(30ms, [&] {
        order.push_back("30");
        took = std::chrono::steady_clock::now() - begin;
        loop.stop();
    });
    loop.postAfter(10ms, [&] { order.push_back("10"); });
    loop.postAfter(-1s, [&] { order.push_back("first"); });
    loop.postAfter(platform::Duration(1e300), [&] { order.push_back("never"); });
    std::thread other([&] {
        loop.post([&] {
            order.push_back("posted");
            loop.post([&] { order.push_back("posted by it"); });
        });
    });
    other.join();
    loop.run();
    EXPECT_THAT(order, ::testing::ElementsAre("first", "posted", "posted by it", "10", "30"));
    EXPECT_GE(took, 30ms);

    // A timer of a worker queue fires too, while the loop runs.
    bool hasFired = false;
    queues.workers(Priority::Background).postAfter(1ms, [&] {
        hasFired = true;
        loop.stop();
    });
    loop.run();
    EXPECT_TRUE(hasFired);
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
    auto never = queues.makeEvent();
    EXPECT_FALSE(never->waitFor(1ms));
}

}  // namespace
}  // namespace vrx::host
