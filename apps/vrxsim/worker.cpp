#include "vrxsim/worker.h"

#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <csignal>
#include <cstdio>
#include <cstring>
#include <system_error>
#include <thread>

namespace vrx::simulation {

namespace {

constexpr unsigned mostSeconds = 300;  // from one line to the next, however slow the build is

[[noreturn]] void work(const std::array<int, 2>& ends, const std::function<void(const Worker::Write&)>& body) {
    close(ends[0]);
    std::FILE* const output = fdopen(ends[1], "w");
    alarm(mostSeconds);
    body([output](const std::string& line) {
        if (std::fputs((line + "\n").c_str(), output) < 0 || std::fflush(output) != 0) _exit(1);
        alarm(mostSeconds);
    });
    _exit(0);
}

}  // namespace

int usualJobs() {
    return static_cast<int>(std::max(1u, std::thread::hardware_concurrency()));
}

Worker::Worker(const std::function<void(const Write&)>& body) {
    std::array<int, 2> ends;
    if (pipe(ends.data()) != 0) throw std::system_error(errno, std::generic_category(), "pipe");
    std::fflush(nullptr);
    process_ = fork();
    if (process_ < 0) throw std::system_error(errno, std::generic_category(), "fork");
    if (process_ == 0) work(ends, body);
    close(ends[1]);
    output_ = ends[0];
}

Worker::~Worker() {
    close(output_);
    if (status_) return;
    kill(process_, SIGKILL);
    waitpid(process_, nullptr, 0);
}

std::vector<std::string> Worker::read() {
    std::array<char, 4096> bytes;
    const ssize_t count = ::read(output_, bytes.data(), bytes.size());
    if (count <= 0) finish();
    text_.append(bytes.data(), static_cast<std::size_t>(std::max<ssize_t>(count, 0)));
    std::vector<std::string> lines;
    std::size_t begin = 0;
    for (std::size_t end; (end = text_.find('\n', begin)) != std::string::npos; begin = end + 1)
        lines.push_back(text_.substr(begin, end - begin));
    text_.erase(0, begin);
    return lines;
}

void Worker::finish() {
    int status = 0;
    waitpid(process_, &status, 0);
    status_ = status;
}

std::string Worker::ending() const {
    const int status = status_.value_or(0);
    const int signal = WIFSIGNALED(status) ? WTERMSIG(status) : 0;
    if (signal == SIGALRM) return "it has no end";
    if (signal != 0) return std::string("it ended by ") + strsignal(signal);
    return "it exited with " + std::to_string(WEXITSTATUS(status));
}

}  // namespace vrx::simulation
