// How an ended agent starts again. Under a service manager it only ends, and the manager starts a fresh process.
// Started by hand, its process executes the program again and passes on what must not be lost meanwhile: the socket at
// which clients wait, and the lock of the home.
#pragma once

#include <string>

#include "vrx/host/base/descriptor.h"
#include "vrx/host/ipc/listening_socket.h"

namespace vrx::host {

bool isUnderServiceManager();

class Restart {
public:
    // Notes the program's path at the start, before the file can be replaced: the new file is executed then.
    Restart();

    // Returns only when the program cannot be executed. The descriptors are closed then.
    void execute(char** arguments, PassedSocket socket, Descriptor homeLock) const;

private:
    std::string program_;
};

}  // namespace vrx::host
