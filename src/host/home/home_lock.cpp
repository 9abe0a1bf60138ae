#include "vrx/host/home/home_lock.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <systemd/sd-daemon.h>
#include <unistd.h>

#include <array>
#include <cerrno>

#include "vrx/host/base/files.h"

namespace vrx::host {

using platform::Error;
using platform::MaybeError;

namespace {

std::string pathIn(const std::string& home) {
    return home + "/lock";
}

// A lock of the whole file that belongs to the open file, not to the process: it can be handed over, and queried
// without being taken.
struct flock wholeFile() {
    struct flock lock {};
    lock.l_type = F_WRLCK;
    lock.l_whence = SEEK_SET;
    return lock;
}

std::string ownerIn(int file) {
    std::array<char, 32> text;
    const ssize_t size = pread(file, text.data(), text.size(), 0);
    return size > 1 ? " (process " + std::string(text.data(), static_cast<std::size_t>(size) - 1) + ")" : "";
}

// The descriptor of that file among those passed to this program, if it was passed. The service's socket may be
// another.
Descriptor passedFile(const std::string& path) {
    struct stat wanted;
    if (stat(path.c_str(), &wanted) != 0) return Descriptor();
    const int count = sd_listen_fds(0);
    for (int number = SD_LISTEN_FDS_START; number < SD_LISTEN_FDS_START + count; ++number) {
        struct stat status;
        if (fstat(number, &status) == 0 && status.st_dev == wanted.st_dev && status.st_ino == wanted.st_ino)
            return Descriptor(number);
    }
    return Descriptor();
}

}  // namespace

MaybeError HomeLock::take(const std::string& home) {
    if (isTaken()) return std::nullopt;
    if (MaybeError error = createDirectories(home)) return error;
    const std::string path = pathIn(home);
    Descriptor file = passedFile(path);
    if (!file) file = Descriptor(::open(path.c_str(), O_RDWR | O_CREAT | O_CLOEXEC | O_NOFOLLOW, 0600));
    if (!file) return systemError("open", path, errno);
    struct flock lock = wholeFile();
    if (fcntl(file.number(), F_OFD_SETLK, &lock) != 0) {
        const int number = errno;
        if (number != EWOULDBLOCK) return systemError("lock", path, number);
        return Error{platform::error_domain::system, number,
                     "another agent" + ownerIn(file.number()) + " uses the home " + home};
    }
    // For people. The lock does not depend on it.
    const std::string owner = std::to_string(getpid()) + "\n";
    if (ftruncate(file.number(), 0) != 0 || pwrite(file.number(), owner.data(), owner.size(), 0) < 0)
        return systemError("write", path, errno);
    file_ = std::move(file);
    return std::nullopt;
}

bool HomeLock::isLost(const std::string& home) const {
    struct stat own;
    struct stat present;
    if (!file_ || fstat(file_.number(), &own) != 0) return false;
    if (stat(pathIn(home).c_str(), &present) != 0) return errno == ENOENT || errno == ENOTDIR;
    return own.st_dev != present.st_dev || own.st_ino != present.st_ino;
}

bool HomeLock::isInUse(const std::string& home) {
    const Descriptor file(::open(pathIn(home).c_str(), O_RDWR | O_CLOEXEC | O_NOFOLLOW));
    struct flock lock = wholeFile();
    return file && fcntl(file.number(), F_OFD_GETLK, &lock) == 0 && lock.l_type != F_UNLCK;
}

}  // namespace vrx::host
