// The socket at which clients connect: the one that the service manager passed, or an earlier program of this process,
// else one bound at a path, which takes the place of a file that a dead agent left there. A socket that this process
// has bound goes with it. Main thread.
#pragma once

#include <sys/types.h>

#include <string>

#include "vrx/host/base/descriptor.h"
#include "vrx/platform/error.h"

namespace vrx::host {

// A socket for the program that this process executes next.
struct PassedSocket {
    Descriptor file;
    bool isBoundByUs = false;  // else the service manager keeps it
    // The name under which such a socket is passed.
    static constexpr const char* boundByUsName = "vrxagent-bound";
};

class ListeningSocket {
public:
    ListeningSocket() = default;
    ~ListeningSocket();
    ListeningSocket(const ListeningSocket&) = delete;
    ListeningSocket& operator=(const ListeningSocket&) = delete;

    // The error's code is EADDRINUSE when somebody answers at the path. The file is for its user alone, except in
    // /run/vrxagent, a system service's, where every user may connect.
    platform::MaybeError open(const std::string& path);

    bool isOpen() const { return static_cast<bool>(file_); }
    int number() const { return file_.number(); }
    PassedSocket release();

private:
    void takePassed(const std::string& path);
    void own(const std::string& path);
    platform::MaybeError bind(const std::string& path);

    Descriptor file_;
    std::string boundPath_;  // empty for one that the service manager keeps
    dev_t device_ = 0;
    ino_t inode_ = 0;
};

}  // namespace vrx::host
