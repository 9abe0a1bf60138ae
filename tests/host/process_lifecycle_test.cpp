#include "host/process_lifecycle.h"

#include <gmock/gmock.h>

#include <thread>

#include "support.h"

namespace vrx::host {
namespace {

using platform::WorkInFlight;

TEST(ProcessLifecycle, EndsOnceItIsAskedToAndNothingIsUnderWayOrUnread) {
    LogRecorder log;
    WorkInFlight late;
    {
        MainLoop loop;
        ProcessLifecycle lifecycle(loop);
        bool hasUnread = true;
        lifecycle.setUnreadQuestion([&] { return hasUnread; });
        WorkInFlight first = lifecycle.beginWork(), second = lifecycle.beginWorkUnlessEnding();
        { WorkInFlight unasked = lifecycle.beginWork(); }
        lifecycle.exitCleanWhenIdle();
        lifecycle.exitCleanWhenIdle();
        int rounds = 0;
        std::function<void()> round = [&] {
            EXPECT_FALSE(lifecycle.isEnding());
            ++rounds;
            if (rounds == 1) first.reset();
            if (rounds == 3) second.reset();
            if (rounds == 5) hasUnread = false;
            if (rounds == 5) std::thread([&] { lifecycle.beginWorkUnlessEnding().reset(); }).join();
            if (rounds < 5) loop.post(round);
        };
        loop.post(round);
        loop.run();
        EXPECT_EQ(rounds, 5);
        EXPECT_TRUE(lifecycle.isEnding());
        EXPECT_FALSE(lifecycle.beginWorkUnlessEnding());
        EXPECT_FALSE(loop.wasStoppedBySignal());
        EXPECT_EQ(log.lines().size(), 1u);
        late = lifecycle.beginWork();
    }
    late.reset();
}

}  // namespace
}  // namespace vrx::host
