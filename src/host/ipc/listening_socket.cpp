#include "vrx/host/ipc/listening_socket.h"

#include <fcntl.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/un.h>
#include <systemd/sd-daemon.h>

#include <cerrno>
#include <cstdlib>
#include <cstring>
#include <optional>

#include "vrx/host/base/files.h"
#include "vrx/wire/locations.h"

namespace vrx::host {

using platform::MaybeError;

namespace {

constexpr std::string_view systemFolder = "/run/vrxagent/";

std::optional<sockaddr_un> addressOf(const std::string& path) {
    sockaddr_un address{};
    address.sun_family = AF_UNIX;
    if (path.size() >= sizeof address.sun_path) return std::nullopt;
    std::memcpy(address.sun_path, path.c_str(), path.size());
    return address;
}

const sockaddr* generic(const sockaddr_un& address) {
    return reinterpret_cast<const sockaddr*>(&address);
}

// Checks that only a dead agent's socket, or nothing, is at the path. An error tells what prevents listening there.
MaybeError makeRoom(const std::string& path, const sockaddr_un& address) {
    struct stat status;
    if (lstat(path.c_str(), &status) != 0)
        return errno == ENOENT ? std::nullopt : MaybeError(systemError("examine", path, errno));
    if (!S_ISSOCK(status.st_mode)) return systemError("put a socket in the place of", path, EEXIST);
    const Descriptor probe(socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC | SOCK_NONBLOCK, 0));
    if (connect(probe.number(), generic(address), sizeof address) == 0 || errno == EAGAIN)
        return systemError("listen at", path, EADDRINUSE);
    if (errno != ECONNREFUSED) return systemError("connect to", path, errno);
    return std::nullopt;
}

}  // namespace

ListeningSocket::~ListeningSocket() {
    struct stat status;
    const bool isStillOurs = !boundPath_.empty() && lstat(boundPath_.c_str(), &status) == 0 &&
                             status.st_dev == device_ && status.st_ino == inode_;
    if (isStillOurs) unlink(boundPath_.c_str());
}

MaybeError ListeningSocket::open(const std::string& path) {
    takePassed(path);
    if (!file_)
        if (MaybeError error = bind(path)) return error;
    // Each read then tells who wrote.
    const int on = 1;
    if (setsockopt(file_.number(), SOL_SOCKET, SO_PASSCRED, &on, sizeof on) != 0 ||
        fcntl(file_.number(), F_SETFL, O_NONBLOCK) != 0)
        return systemError("set up", path, errno);
    return std::nullopt;
}

// Takes the stream socket that was passed, if any. One that this process has bound was bound at the same path.
void ListeningSocket::takePassed(const std::string& path) {
    char** names = nullptr;
    const int count = sd_listen_fds_with_names(1, &names);
    for (int i = 0; i < count; ++i) {
        const int number = SD_LISTEN_FDS_START + i;
        if (!file_ && sd_is_socket_unix(number, SOCK_STREAM, 1, nullptr, 0) > 0) {
            file_ = Descriptor(number);
            if (names[i] == std::string_view(PassedSocket::boundByUsName)) own(path);
        }
        std::free(names[i]);
    }
    std::free(names);
}

// Notes the file at the path, which is removed with this process.
void ListeningSocket::own(const std::string& path) {
    struct stat status;
    if (lstat(path.c_str(), &status) != 0) return;
    boundPath_ = path;
    device_ = status.st_dev;
    inode_ = status.st_ino;
}

PassedSocket ListeningSocket::release() {
    const bool isBoundByUs = !std::exchange(boundPath_, "").empty();
    return {std::move(file_), isBoundByUs};
}

// Prepares the socket under a second name and renames it, so that whoever finds it at the path can connect, and it
// never shows with a wrong mode.
MaybeError ListeningSocket::bind(const std::string& path) {
    const std::string newPath = path + wire::newSocketEnding;
    const std::optional<sockaddr_un> address = addressOf(path);
    const std::optional<sockaddr_un> newAddress = addressOf(newPath);
    if (!address || !newAddress) return systemError("listen at", path, ENAMETOOLONG);
    if (MaybeError error = makeRoom(path, *address)) return error;

    Descriptor file(socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC | SOCK_NONBLOCK, 0));
    if (!file) return systemError("make", path, errno);
    unlink(newPath.c_str());
    const mode_t mode = path.starts_with(systemFolder) ? 0666 : 0600;
    if (::bind(file.number(), generic(*newAddress), sizeof *newAddress) != 0)
        return systemError("listen at", path, errno);
    own(newPath);
    if (chmod(newPath.c_str(), mode) != 0 || listen(file.number(), SOMAXCONN) != 0 ||
        rename(newPath.c_str(), path.c_str()) != 0)
        return systemError("listen at", path, errno);
    file_ = std::move(file);
    boundPath_ = path;
    return std::nullopt;
}

}  // namespace vrx::host
