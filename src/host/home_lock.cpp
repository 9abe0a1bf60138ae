#include "host/home_lock.h"

#include <fcntl.h>
#include <sys/file.h>
#include <unistd.h>

#include <array>
#include <cerrno>

#include "host/files.h"

namespace vrx::host {

using platform::Error;
using platform::MaybeError;

namespace {

std::string ownerIn(int file) {
    std::array<char, 32> text;
    const ssize_t size = pread(file, text.data(), text.size(), 0);
    return size > 1 ? " (process " + std::string(text.data(), static_cast<std::size_t>(size) - 1) + ")" : "";
}

}  // namespace

HomeLock::~HomeLock() {
    if (file_ >= 0) ::close(file_);
}

MaybeError HomeLock::take(const std::string& home) {
    if (isTaken()) return std::nullopt;
    if (MaybeError error = createDirectories(home)) return error;
    const std::string path = home + "/lock";
    const int file = ::open(path.c_str(), O_RDWR | O_CREAT | O_CLOEXEC | O_NOFOLLOW, 0600);
    if (file < 0) return systemError("open", path, errno);
    if (flock(file, LOCK_EX | LOCK_NB) != 0) {
        const int number = errno;
        MaybeError error = systemError("lock", path, number);
        if (number == EWOULDBLOCK)
            error = Error{"system", number, "another agent" + ownerIn(file) + " uses the home " + home};
        ::close(file);
        return error;
    }
    file_ = file;
    // For people; the lock itself does not depend on it.
    const std::string owner = std::to_string(getpid()) + "\n";
    if (ftruncate(file, 0) != 0 || pwrite(file, owner.data(), owner.size(), 0) < 0)
        return systemError("write", path, errno);
    return std::nullopt;
}

}  // namespace vrx::host
