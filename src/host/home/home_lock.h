// Reserves a home directory for one agent. The lock ends with its object or with the process. Handed over as a file, it
// stays with the program that the process executes next.
#pragma once

#include <string>

#include "vrx/host/base/descriptor.h"
#include "vrx/platform/error.h"

namespace vrx::host {

class HomeLock {
public:
    // Makes the directory if need be. Takes over a lock that an earlier program of this process handed over. When
    // another agent has the home, the error's code is EWOULDBLOCK and its text names the process.
    platform::MaybeError take(const std::string& home);
    bool isTaken() const { return static_cast<bool>(file_); }
    // Whether the lock's file is gone from the home, or another is in its place, so that another agent may have taken
    // the home. False when that cannot be told.
    bool isLost(const std::string& home) const;
    // Gives up the locked file. The home stays locked while that file is open.
    Descriptor release() { return std::move(file_); }

    // Whether an agent has the home. Does not take the lock.
    static bool isInUse(const std::string& home);

private:
    Descriptor file_;
};

}  // namespace vrx::host
