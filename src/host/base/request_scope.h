// What the host does once for a request while its operation runs on the connection's thread, rather than at each of the
// agent's questions: it looks whether a file has changed, and hands over the lines that the request has logged.
#pragma once

#include <algorithm>
#include <array>
#include <cstddef>
#include <string>
#include <utility>
#include <vector>

namespace vrx::host {

// Lines of the log, one after another.
struct LogLines {
    std::string bytes;
    std::vector<std::size_t> ends;

    bool isEmpty() const { return ends.empty(); }
    void clear() {
        bytes.clear();
        ends.clear();
    }
    // What is left of a line for whose rest there was no memory is dropped.
    void dropUnfinished() { bytes.resize(isEmpty() ? 0 : ends.back()); }
    // The bytes first: without memory for an end, its line is one that was not finished.
    void append(const LogLines& lines) {
        dropUnfinished();
        const std::size_t before = bytes.size();
        bytes += lines.bytes;
        for (const std::size_t end : lines.ends) ends.push_back(before + end);
    }
};

class LogLinesTaker {
public:
    virtual ~LogLinesTaker() = default;
    virtual void take(const LogLines& lines) = 0;
};

// While one is alive, its thread works for one request.
class RequestScope {
public:
    RequestScope() {
        handOverLines();  // an outer one's
        outer_ = std::exchange(current_, this);
    }
    ~RequestScope() {
        handOverLines();
        current_ = outer_;
    }
    RequestScope(const RequestScope&) = delete;
    RequestScope& operator=(const RequestScope&) = delete;

    // Whether the object looks at its file for the first time in this request; always true outside of requests.
    static bool isFirstLook(const void* object) {
        if (!current_) return true;
        auto& looks = current_->looks_;
        const auto end = looks.begin() + static_cast<std::ptrdiff_t>(current_->lookCount_);
        if (std::find(looks.begin(), end, object) != end) return false;
        if (current_->lookCount_ < looks.size()) looks[current_->lookCount_++] = object;
        return true;
    }

    // The lines that this thread's request has logged since the last handing over, to be added to; null outside of
    // requests. They go to the taker.
    static LogLines* linesFor(LogLinesTaker& taker) {
        if (!current_) return nullptr;
        if (current_->taker_ != &taker) {
            handOverLines();
            current_->taker_ = &taker;
        }
        return &lines_;
    }
    // To be called before the thread waits for anything, and before the request is replied to.
    static void handOverLines() {
        if (!current_ || lines_.isEmpty()) return;
        current_->taker_->take(lines_);
        lines_.clear();
    }
    // For a crash: what is lost otherwise.
    static const LogLines& ownLines() { return lines_; }

private:
    static inline thread_local RequestScope* current_ = nullptr;
    static inline thread_local LogLines lines_;  // the thread's, so that its memory is used again

    RequestScope* outer_ = nullptr;
    LogLinesTaker* taker_ = nullptr;
    std::array<const void*, 8> looks_{};
    std::size_t lookCount_ = 0;
};

}  // namespace vrx::host
