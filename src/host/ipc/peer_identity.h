// Who is at the other end of a connection: the process that connected, its user and group at that time, and the program
// it runs. Race-free: a process that gets the same number later is never mistaken for the peer. The program tells who
// calls, but proves nothing against hostile code of the same user, which can trace or preload it. One thread at a time.
#pragma once

#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/types.h>

#include <optional>
#include <string>

#include "vrx/host/base/descriptor.h"
#include "vrx/platform/error.h"

namespace vrx::host {

class PeerIdentity {
public:
    // An error when the peer has already ended, or when there is no descriptor or memory left (isShortage).
    static platform::Result<PeerIdentity> ofPeer(int socket);
    // Its process, user and group alone, for which no descriptor is needed.
    static platform::Result<ucred> credentialsOf(int socket);

    pid_t processIdentifier() const { return credentials_.pid; }
    uid_t user() const { return credentials_.uid; }
    gid_t group() const { return credentials_.gid; }
    const ucred& credentials() const { return credentials_; }

    // The program's absolute path. Empty when it cannot be read (another user's or a protected process), and when
    // another file is at that path by now.
    const std::string& executable() const { return executable_; }

    // The identifier of the Flatpak application in whose sandbox the peer runs, from the file that Flatpak puts at the
    // sandbox's root. An error with ENOENT when there is none, another when the file cannot be read, as another user's,
    // or names no application. Read when first asked for, and the same from then on. Proves no more than executable():
    // users can give their processes any root.
    const platform::Result<std::string>& flatpakApplication() const;

    // Whether the peer still lives and runs the program that it ran when it was identified.
    bool runsSameProgram() const;

private:
    PeerIdentity() = default;
    platform::MaybeError findExecutable();
    platform::Result<std::string> readFlatpakApplication() const;

    ucred credentials_{};
    Descriptor process_;  // /proc/PID of this very process
    Descriptor program_;  // the program's file, held so that its inode is not used again
    struct stat programStatus_ {};
    std::string executable_;
    mutable std::optional<platform::Result<std::string>> flatpakApplication_;
};

// The path of the program that a process runs, like PeerIdentity::executable(), but not race-free.
std::string executableOfProcess(pid_t processIdentifier);

}  // namespace vrx::host
