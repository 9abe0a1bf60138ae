#include "vrx/host/restart.h"

#include <fcntl.h>
#include <systemd/sd-daemon.h>
#include <unistd.h>

#include <array>
#include <cstdlib>

namespace vrx::host {

namespace {

constexpr const char* ownProgram = "/proc/self/exe";

// Moves the descriptor above the numbers of those that are passed.
Descriptor moveUp(Descriptor file) {
    constexpr int above = SD_LISTEN_FDS_START + 2;
    return Descriptor(fcntl(file.number(), F_DUPFD_CLOEXEC, above));
}

}  // namespace

// Shells inherit INVOCATION_ID from the service that they were started in; SYSTEMD_EXEC_PID names the service's own
// process.
bool isUnderServiceManager() {
    if (std::getenv("NOTIFY_SOCKET")) return true;
    const char* process = std::getenv("SYSTEMD_EXEC_PID");
    return std::getenv("INVOCATION_ID") && process && std::atoi(process) == getpid();
}

Restart::Restart() {
    std::array<char, 4096> path;
    const ssize_t size = readlink(ownProgram, path.data(), path.size());
    if (size > 0) program_.assign(path.data(), static_cast<std::size_t>(size));
}

void Restart::execute(char** arguments, PassedSocket socket, Descriptor homeLock) const {
    const Descriptor sources[] = {moveUp(std::move(socket.file)), moveUp(std::move(homeLock))};
    Descriptor passed[2];
    for (int i = 0; i < 2; ++i)
        passed[i] = Descriptor(dup2(sources[i].number(), SD_LISTEN_FDS_START + i));  // stays open in the next program
    setenv("LISTEN_PID", std::to_string(getpid()).c_str(), 1);
    setenv("LISTEN_FDS", "2", 1);
    setenv("LISTEN_FDNAMES",
           (std::string(socket.isBoundByUs ? PassedSocket::boundByUsName : "socket") + ":home-lock").c_str(), 1);
    execv(program_.c_str(), arguments);
    execv(ownProgram, arguments);
}

}  // namespace vrx::host
