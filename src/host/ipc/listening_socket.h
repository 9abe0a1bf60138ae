// The socket at which clients connect: one that the service manager or an earlier program of this process passed, else
// one bound at a path, in place of a file that a dead agent left there. A socket bound by this process is removed with
// it. Main thread.
#pragma once

#include <sys/types.h>

#include <string>

#include "vrx/host/base/descriptor.h"
#include "vrx/platform/error.h"

namespace vrx::host {

// A socket for the program that this process executes next.
struct PassedSocket {
    Descriptor file;
    bool isBoundByUs = false;  // else the service manager owns it
    // The name under which a socket bound by us is passed.
    static constexpr const char* boundByUsName = "vrxagent-bound";
};

class ListeningSocket {
public:
    ListeningSocket() = default;
    ~ListeningSocket();
    ListeningSocket(const ListeningSocket&) = delete;
    ListeningSocket& operator=(const ListeningSocket&) = delete;

    // The error's code is EADDRINUSE when somebody listens at the path. Only the agent's user may connect, except in
    // /run/vrxagent, where the system service's socket is open to every user.
    platform::MaybeError open(const std::string& path);

    bool isOpen() const { return static_cast<bool>(file_); }
    int number() const { return file_.number(); }
    PassedSocket release();

private:
    void takePassed(const std::string& path);
    void own(const std::string& path);
    platform::MaybeError bind(const std::string& path);

    Descriptor file_;
    std::string boundPath_;  // empty when the service manager owns the socket
    dev_t device_ = 0;
    ino_t inode_ = 0;
};

}  // namespace vrx::host
