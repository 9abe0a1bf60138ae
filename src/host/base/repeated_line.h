// A line of the log that what others do can bring up again and again: written at once, then once a minute at the most,
// with the number of those left out since. Any thread may write it.
#pragma once

#include <chrono>
#include <mutex>
#include <optional>
#include <string>
#include <utility>

#include "vrx/platform/log.h"

namespace vrx::host {

class RepeatedLine {
public:
    void write(platform::Level level, const std::string& text) {
        const std::optional<unsigned> leftOut = admit();
        if (!leftOut) return;
        log(level, "%@%@", text, *leftOut > 0 ? " (and " + std::to_string(*leftOut) + " times before)" : "");
    }

private:
    using SteadyClock = std::chrono::steady_clock;

    // The number of lines left out since the last one; nothing when this one is left out, too.
    std::optional<unsigned> admit() {
        const auto now = SteadyClock::now();
        std::lock_guard lock(mutex_);
        if (last_ && now - *last_ < std::chrono::minutes(1)) {
            ++leftOut_;
            return std::nullopt;
        }
        last_ = now;
        return std::exchange(leftOut_, 0);
    }

    std::mutex mutex_;
    std::optional<SteadyClock::time_point> last_;
    unsigned leftOut_ = 0;
};

}  // namespace vrx::host
