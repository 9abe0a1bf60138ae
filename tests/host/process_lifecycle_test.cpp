#include "host/process_lifecycle.h"

#include <gmock/gmock.h>

#include <thread>

#include "support.h"

namespace vrx::host {
namespace {

using platform::WorkInFlight;

TEST(ProcessLifecycle, EndsOnceItIsAskedToAndNothingIsUnderWayOrUnread) {
    LogRecorder log;
    MainLoop loop;
    ProcessLifecycle lifecycle(loop);
    std::vector<std::string> order;
    bool hasUnread = true;
    lifecycle.setUnreadQuestion([&] { return hasUnread; });
    WorkInFlight first = lifecycle.beginWork(), second = lifecycle.beginWorkUnlessEnding();
    { WorkInFlight unasked = lifecycle.beginWork(); }
    lifecycle.exitCleanWhenIdle();
    lifecycle.exitCleanWhenIdle();
    loop.post([&] {
        order.push_back("first");
        first.reset();
        // Begun by work that is at its end.
        loop.post([&, third = std::exchange(second, nullptr)] { order.push_back("third"); });
    });
    loop.post([&] {
        loop.post([&] {
            loop.post([&] {
                order.push_back("unread");
                EXPECT_FALSE(lifecycle.isEnding());
                hasUnread = false;
                std::thread([&] { lifecycle.beginWorkUnlessEnding().reset(); }).join();
            });
        });
    });
    loop.run();
    EXPECT_THAT(order, ::testing::ElementsAre("first", "third", "unread"));
    EXPECT_TRUE(lifecycle.isEnding());
    EXPECT_FALSE(lifecycle.beginWorkUnlessEnding());
    EXPECT_TRUE(lifecycle.beginWork());
    EXPECT_FALSE(loop.wasStoppedBySignal());
    EXPECT_EQ(log.lines().size(), 1u);
}

TEST(ProcessLifecycle, IsOutlivedByWork) {
    LogRecorder log;
    WorkInFlight work;
    {
        MainLoop loop;
        ProcessLifecycle lifecycle(loop);
        work = lifecycle.beginWork();
        lifecycle.exitCleanWhenIdle();
    }
    work.reset();
}

}  // namespace
}  // namespace vrx::host
