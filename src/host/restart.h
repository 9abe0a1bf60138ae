// How an agent that has ended starts anew. Under a service manager it only ends, and the manager starts a fresh
// process; by hand, its process executes the program again, with what must not be let go of meanwhile: the socket at
// which clients wait, and the lock of the home.
#pragma once

#include <string>

#include "vrx/host/base/descriptor.h"
#include "vrx/host/ipc/listening_socket.h"

namespace vrx::host {

bool isUnderServiceManager();

class Restart {
public:
    // Notes which program this is, before it is replaced on disk: the new one is executed then.
    Restart();

    // Comes back only when the program cannot be executed; what is handed over is closed then.
    void execute(char** arguments, PassedSocket socket, Descriptor homeLock) const;

private:
    std::string program_;
};

}  // namespace vrx::host
