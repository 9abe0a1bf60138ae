// A process of its own that does something and tells of it line by line, because the simulated platform is one for a
// process, and because what goes wrong there may end it.
#pragma once

#include <sys/types.h>

#include <functional>
#include <optional>
#include <string>
#include <vector>

namespace vrx::simulation {

// As many workers side by side as there are processors.
int usualJobs();

class Worker {
public:
    // The body writes lines, which hold no line break, until it returns. It is ended when none comes for too long.
    using Write = std::function<void(const std::string& line)>;
    explicit Worker(const std::function<void(const Write&)>& body);
    ~Worker();
    Worker(const Worker&) = delete;
    Worker& operator=(const Worker&) = delete;

    // To wait for something to come.
    int output() const { return output_; }
    // The lines that have come by now; waits for something to come. After the last one, isOver().
    std::vector<std::string> read();
    bool isOver() const { return status_.has_value(); }
    bool hasFailed() const { return status_.value_or(0) != 0; }
    // How it ended, for people.
    std::string ending() const;

private:
    void finish();

    pid_t process_ = -1;
    int output_ = -1;
    std::string text_;
    std::optional<int> status_;
};

}  // namespace vrx::simulation
