#include "vrx/host/loop/process_lifecycle.h"

#include <thread>

#include "host/support.h"

namespace vrx::host {
namespace {

using platform::WorkInFlight;

TEST(ProcessLifecycle, EndsOnceItIsAskedToAndNothingIsUnderWayOrUnread) {
    LogRecorder log;
    MainLoop loop;
    std::optional<ProcessLifecycle> lifecycle(loop);
    bool hasUnread = true;
    lifecycle->setUnreadQuestion([&] { return hasUnread; });
    WorkInFlight first = lifecycle->beginWork(), second = lifecycle->beginWorkUnlessEnding();
    lifecycle->exitCleanWhenIdle();
    int rounds = 0;
    std::function<void()> round = [&] {
        EXPECT_FALSE(lifecycle->isEnding());
        ++rounds;
        if (rounds == 1) first.reset();
        if (rounds == 3) second.reset();
        if (rounds == 5) hasUnread = false;
        if (rounds == 5) std::thread([&] { lifecycle->beginWorkUnlessEnding().reset(); }).join();
        if (rounds < 5) loop.post(round);
    };
    loop.post(round);
    loop.run();
    EXPECT_EQ(rounds, 5);
    EXPECT_TRUE(lifecycle->isEnding());
    EXPECT_FALSE(lifecycle->beginWorkUnlessEnding());
    WorkInFlight late = lifecycle->beginWork();
    lifecycle.reset();
}

}  // namespace
}  // namespace vrx::host
