// Keeps a home directory to one agent. The lock ends with its object, or with the process, however that ends; unless
// its file is handed over to the program that the process executes next, which then has the home without a gap.
#pragma once

#include <string>

#include "vrx/host/base/descriptor.h"
#include "vrx/platform/error.h"

namespace vrx::host {

class HomeLock {
public:
    // Makes the directory if need be, and takes over the lock that an earlier program of this process handed over. When
    // another agent has the home, the error's code is EWOULDBLOCK and its text tells which process.
    platform::MaybeError take(const std::string& home);
    bool isTaken() const { return static_cast<bool>(file_); }
    // The locked file. The home stays locked for as long as it is open.
    Descriptor release() { return std::move(file_); }

    // Whether some agent has the home. Takes nothing.
    static bool isInUse(const std::string& home);

private:
    Descriptor file_;
};

}  // namespace vrx::host
