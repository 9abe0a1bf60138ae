// Keeps a home directory to one agent. The lock ends with its object, or with the process, however that ends.
#pragma once

#include <string>

#include "platform/error.h"

namespace vrx::host {

class HomeLock {
public:
    HomeLock() = default;
    ~HomeLock();
    HomeLock(const HomeLock&) = delete;
    HomeLock& operator=(const HomeLock&) = delete;

    // Makes the directory if need be. When another agent has the home, the error's code is EWOULDBLOCK and its text
    // tells which process.
    platform::MaybeError take(const std::string& home);
    bool isTaken() const { return file_ >= 0; }

private:
    int file_ = -1;
};

}  // namespace vrx::host
