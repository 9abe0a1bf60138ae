// Shows at a terminal that something takes its time: a line on standard error that appears after half a second, counts
// the seconds, and is erased when the object is destroyed. Writes nothing when standard error is not a terminal.
#pragma once

#include <condition_variable>
#include <mutex>
#include <string>
#include <thread>

namespace vrx::apps {

class Progress {
public:
    explicit Progress(std::string text);
    ~Progress();
    Progress(const Progress&) = delete;
    Progress& operator=(const Progress&) = delete;

private:
    void run();

    const std::string text_;
    std::mutex mutex_;
    std::condition_variable ended_;
    bool isEnded_ = false;
    std::thread thread_;
};

}  // namespace vrx::apps
