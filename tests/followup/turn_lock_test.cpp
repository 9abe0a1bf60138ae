// The lock of pieces of work: one thread at a time, which may take it again, and then whoever waits.
#include "vrx/followup/turn_lock.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <vector>

namespace vrx {
namespace {

TEST(TurnLock, LetsOneThreadInAtATime) {
    constexpr int threads = 4, turns = 500;
    TurnLock lock;
    int inside = 0, worst = 0, taken = 0;
    const auto takeTurns = [&] {
        for (int i = 0; i < turns; ++i) {
            const std::unique_lock outer(lock);
            worst = std::max(worst, ++inside);
            { const std::unique_lock inner(lock); }
            std::this_thread::yield();
            worst = std::max(worst, inside--);
            ++taken;
        }
    };
    std::vector<std::thread> all;
    for (int i = 0; i < threads; ++i) all.emplace_back(takeTurns);
    for (std::thread& thread : all) thread.join();
    EXPECT_EQ(worst, 1);
    EXPECT_EQ(taken, threads * turns);
}

}  // namespace
}  // namespace vrx
