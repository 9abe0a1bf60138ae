// Waiting in tests for what other threads and processes do: it comes soon, or the test fails instead of hanging.
#pragma once

#include <gtest/gtest.h>

#include <chrono>
#include <thread>

namespace vrx {

// Looks until the condition holds, and gives whether it did within a minute; else the test fails with the text, which
// says what was waited for. The last two arguments are where the call stands.
template <class Condition>
bool eventually(Condition condition, const char* what, const char* file = __builtin_FILE(),
                int line = __builtin_LINE()) {
    using namespace std::chrono_literals;
    const auto end = std::chrono::steady_clock::now() + 60s;
    for (int looks = 0; !condition(); ++looks) {
        if (std::chrono::steady_clock::now() >= end) {
            ADD_FAILURE_AT(file, line) << "did not come in a minute: " << what;
            return false;
        }
        if (looks < 100)
            std::this_thread::yield();
        else
            std::this_thread::sleep_for(1ms);
    }
    return true;
}

}  // namespace vrx
