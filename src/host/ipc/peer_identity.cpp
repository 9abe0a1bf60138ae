#include "vrx/host/ipc/peer_identity.h"

#include <fcntl.h>
#include <poll.h>
#include <sys/socket.h>
#include <sys/syscall.h>

#include <array>
#include <cerrno>
#include <climits>
#include <cstdio>
#include <ctime>
#include <fstream>
#include <sstream>

#include "vrx/codec/key_file.h"
#include "vrx/host/base/files.h"
#include "vrx/host/base/text.h"

namespace vrx::host {

using platform::Result;

namespace {

constexpr std::size_t mostSandboxFileBytes = 64 * 1024;
constexpr int peerPidfdOption = 77;  // SO_PEERPIDFD, since Linux 6.5; the headers do not have it yet

bool isSameFile(const struct stat& one, const struct stat& other) {
    return one.st_dev == other.st_dev && one.st_ino == other.st_ino;
}

Descriptor openProcessFolder(pid_t processIdentifier) {
    const std::string path = "/proc/" + std::to_string(processIdentifier);
    return Descriptor(open(path.c_str(), O_PATH | O_DIRECTORY | O_CLOEXEC));
}

bool hasEnded(const Descriptor& pidfd) {
    pollfd ended{pidfd.number(), POLLIN, 0};
    return poll(&ended, 1, 0) != 0;
}

// Whether the process had started by that moment, so that its number was not reused since.
bool hasStartedBefore(const Descriptor& process, const timespec& moment) {
    std::ifstream file("/proc/self/fd/" + std::to_string(process.number()) + "/stat");
    std::string text;
    if (!std::getline(file, text)) return false;
    // The start time is the 22nd field; the 2nd, the name in parentheses, may hold anything.
    const std::size_t name = text.rfind(')');
    if (name == std::string::npos) return false;
    std::istringstream fields(text.substr(name + 1));
    std::string skipped;
    for (int field = 3; field < 22; ++field) fields >> skipped;
    long long started = 0;
    if (!(fields >> started)) return false;
    const long long perSecond = sysconf(_SC_CLK_TCK);
    return started <= moment.tv_sec * perSecond + moment.tv_nsec * perSecond / 1'000'000'000;
}

// The program's path, if the file there still is the program.
std::string pathOfProgram(const Descriptor& process, const struct stat& program) {
    std::array<char, PATH_MAX> buffer;
    const ssize_t length = readlinkat(process.number(), "exe", buffer.data(), buffer.size());
    if (length <= 0 || static_cast<std::size_t>(length) == buffer.size()) return {};
    std::string path(buffer.data(), static_cast<std::size_t>(length));
    struct stat status;
    return stat(path.c_str(), &status) == 0 && isSameFile(status, program) ? path : std::string();
}

}  // namespace

// Opens the process's folder first and only then checks that the process has not ended: in this order the folder cannot
// be another's.
Result<PeerIdentity> PeerIdentity::ofPeer(int socket) {
    timespec now{};
    clock_gettime(CLOCK_BOOTTIME, &now);
    const Result<ucred> found = credentialsOf(socket);
    if (!found) return found.error();
    const ucred& credentials = *found;

    int pidfd = -1;
    socklen_t size = sizeof pidfd;
    const bool isExact = getsockopt(socket, SOL_SOCKET, peerPidfdOption, &pidfd, &size) == 0;
    const Descriptor guard(isExact ? pidfd : openProcess(credentials.pid).release());
    if (!guard) return systemError("identify", "process " + std::to_string(credentials.pid), errno);

    PeerIdentity peer;
    peer.credentials_ = credentials;
    peer.process_ = openProcessFolder(credentials.pid);
    if (!peer.process_ && isShortage(errno)) return systemError("identify", "the peer", errno);
    // The process still lives, so the folder opened above is its own. A signal of 0 would not detect a zombie.
    if (!peer.process_ || hasEnded(guard) || (!isExact && !hasStartedBefore(peer.process_, now)))
        return systemError("identify", "process " + std::to_string(credentials.pid), ESRCH);
    if (platform::MaybeError error = peer.findExecutable()) return *error;
    return peer;
}

Result<ucred> PeerIdentity::credentialsOf(int socket) {
    ucred credentials{};
    socklen_t size = sizeof credentials;
    if (getsockopt(socket, SOL_SOCKET, SO_PEERCRED, &credentials, &size) != 0)
        return systemError("identify", "the peer", errno);
    return credentials;
}

// Another user's program may be hidden, which is no error.
platform::MaybeError PeerIdentity::findExecutable() {
    program_ = Descriptor(openat(process_.number(), "exe", O_PATH | O_CLOEXEC));
    if (!program_ && isShortage(errno)) return systemError("identify", "the peer's program", errno);
    if (program_ && fstat(program_.number(), &programStatus_) == 0)
        executable_ = pathOfProgram(process_, programStatus_);
    return std::nullopt;
}

// What failed for want of descriptors may work the next time.
const Result<std::string>& PeerIdentity::flatpakApplication() const {
    if (!flatpakApplication_ || (!*flatpakApplication_ && isShortage(flatpakApplication_->error().code)))
        flatpakApplication_.emplace(readFlatpakApplication());
    return *flatpakApplication_;
}

// Through the process's own folder, whose root is the one that the process sees.
Result<std::string> PeerIdentity::readFlatpakApplication() const {
    const std::string path = "root/.flatpak-info";
    const std::string whole = "/proc/" + std::to_string(processIdentifier()) + "/" + path;
    const Result<FileContent> file = readFileIn(process_, path, mostSandboxFileBytes);
    if (!file) return systemError("read", whole, file.error().code);
    std::optional<std::string> name;
    const bool isRead = codec::readKeyFile(file->text(), "Application", [&](auto key, auto value) {
        if (key == "name" && !name) name = value;
    });
    if (isRead && name && isApplicationIdentifier(*name)) return *name;
    return systemError("find", "an application in " + whole, EINVAL);
}

bool PeerIdentity::runsSameProgram() const {
    struct stat status;
    return program_ && fstatat(process_.number(), "exe", &status, 0) == 0 && isSameFile(status, programStatus_);
}

std::string executableOfProcess(pid_t processIdentifier) {
    const Descriptor process = openProcessFolder(processIdentifier);
    struct stat status;
    if (!process || fstatat(process.number(), "exe", &status, 0) != 0) return {};
    return pathOfProgram(process, status);
}

}  // namespace vrx::host
