// A file descriptor that is closed with its owner.
#pragma once

#include <sys/eventfd.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <cerrno>
#include <chrono>
#include <system_error>
#include <thread>
#include <utility>

namespace vrx::host {

class Descriptor {
public:
    explicit Descriptor(int number = -1) : number_(number) {}
    Descriptor(Descriptor&& other) noexcept : number_(std::exchange(other.number_, -1)) {}
    Descriptor& operator=(Descriptor&& other) noexcept {
        std::swap(number_, other.number_);
        return *this;
    }
    ~Descriptor() {
        if (number_ >= 0) ::close(number_);
    }

    explicit operator bool() const { return number_ >= 0; }
    int number() const { return number_; }
    // Gives the descriptor up without closing it.
    int release() { return std::exchange(number_, -1); }

private:
    int number_;
};

// An event counter, by which one thread wakes another that polls it. Throws when there are no descriptors left.
inline Descriptor makeEventFile() {
    Descriptor file(eventfd(0, EFD_CLOEXEC | EFD_NONBLOCK));
    if (!file) throw std::system_error(errno, std::generic_category(), "eventfd");
    return file;
}

// For a thread that goes on although its poll has failed, perhaps for good: without its wait it would spin.
inline void pauseAfterFailedPoll() {
    std::this_thread::sleep_for(std::chrono::milliseconds(100));
}

// A descriptor of a process, readable once it has ended. The library's own function cannot be called from C++ before
// glibc 2.37.
inline Descriptor openProcess(pid_t processIdentifier) {
    return Descriptor(static_cast<int>(syscall(SYS_pidfd_open, processIdentifier, 0)));
}

}  // namespace vrx::host
