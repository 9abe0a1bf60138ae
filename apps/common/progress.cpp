#include "common/progress.h"

#include <unistd.h>

#include <chrono>
#include <cstdio>
#include <utility>

namespace vrx::apps {

using std::chrono::steady_clock;

Progress::Progress(std::string text) : text_(std::move(text)) {
    if (isatty(STDERR_FILENO)) thread_ = std::thread([this] { run(); });
}

Progress::~Progress() {
    if (!thread_.joinable()) return;
    {
        std::lock_guard lock(mutex_);
        isEnded_ = true;
    }
    ended_.notify_one();
    thread_.join();
}

void Progress::run() {
    const steady_clock::time_point begun = steady_clock::now();
    std::size_t shown = 0;
    std::unique_lock lock(mutex_);
    auto next = begun + std::chrono::milliseconds(500);
    for (; !ended_.wait_until(lock, next, [this] { return isEnded_; }); next += std::chrono::seconds(1)) {
        const auto seconds = std::chrono::floor<std::chrono::seconds>(next - begun).count();
        const std::string line = seconds > 0 ? text_ + " " + std::to_string(seconds) + " s" : text_;
        std::fprintf(stderr, "\r%s", line.c_str());
        shown = line.size();
    }
    // Erases with blanks, because every terminal understands them.
    if (shown > 0) std::fprintf(stderr, "\r%*s\r", static_cast<int>(shown), "");
}

}  // namespace vrx::apps
