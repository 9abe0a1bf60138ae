#include "vrx/host/base/files.h"

#include <fcntl.h>
#include <sys/file.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstdio>
#include <cstring>

#include "vrx/codec/property_list.h"

namespace vrx::host {

using platform::Data;
using platform::Error;
using platform::MaybeError;
using platform::Result;
using platform::Value;

Error systemError(const std::string& what, const std::string& path, int number) {
    return Error{platform::error_domain::system, number, "cannot " + what + " " + path + ": " + std::strerror(number)};
}

namespace {

class OpenFile {
public:
    OpenFile(const char* path, int flags) {
        do file_ = ::open(path, flags | O_CLOEXEC, 0600);
        while (file_ < 0 && errno == EINTR);
    }
    ~OpenFile() {
        if (file_ >= 0) ::close(file_);
    }
    OpenFile(const OpenFile&) = delete;
    OpenFile& operator=(const OpenFile&) = delete;

    explicit operator bool() const { return file_ >= 0; }
    int number() const { return file_; }

private:
    int file_;
};

int lockFile(int file) {
    int result;
    do result = ::flock(file, LOCK_EX);
    while (result != 0 && errno == EINTR);
    return result;
}

bool writeAll(int file, std::span<const std::uint8_t> bytes) {
    while (!bytes.empty()) {
        ssize_t written = ::write(file, bytes.data(), bytes.size());
        if (written < 0 && errno == EINTR) continue;
        if (written <= 0) return false;
        bytes = bytes.subspan(static_cast<std::size_t>(written));
    }
    return true;
}

std::string folderOf(const std::string& path) {
    std::size_t slash = path.rfind('/');
    if (slash == std::string::npos) return ".";
    return slash == 0 ? "/" : path.substr(0, slash);
}

MaybeError syncFolder(const std::string& folder) {
    OpenFile directory(folder.c_str(), O_RDONLY | O_DIRECTORY);
    if (!directory || ::fsync(directory.number()) != 0) return systemError("sync", folder, errno);
    return std::nullopt;
}

Result<FileContent> readOpenFile(int file, const std::string& path, std::size_t limit) {
    FileContent content;
    if (::fstat(file, &content.status) != 0) return systemError("examine", path, errno);
    if (!S_ISREG(content.status.st_mode)) return systemError("read", path, EINVAL);

    // The size is only a first guess: the file may grow meanwhile, and those of /proc and /sys have none.
    std::size_t size = 0;
    Data& bytes = content.bytes;
    bytes.resize(std::min(static_cast<std::size_t>(content.status.st_size), limit) + 1);
    while (true) {
        ssize_t count = ::read(file, bytes.data() + size, bytes.size() - size);
        if (count < 0 && errno == EINTR) continue;
        if (count < 0) return systemError("read", path, errno);
        if (count == 0) break;
        size += static_cast<std::size_t>(count);
        if (size > limit) return systemError("read", path, EFBIG);
        if (size == bytes.size()) bytes.resize(std::min(2 * size + 4096, limit + 1));
    }
    bytes.resize(size);
    return content;
}

}  // namespace

Result<FileContent> readFile(const std::string& path, std::size_t limit) {
    const OpenFile file(path.c_str(), O_RDONLY | O_NONBLOCK | O_NOCTTY);
    if (!file) return systemError("open", path, errno);
    return readOpenFile(file.number(), path, limit);
}

Result<FileContent> readFileIn(const Descriptor& folder, const std::string& path, std::size_t limit) {
    constexpr int flags = O_RDONLY | O_NOFOLLOW | O_NONBLOCK | O_NOCTTY | O_CLOEXEC;
    const Descriptor file(::openat(folder.number(), path.c_str(), flags));
    if (!file) return systemError("open", path, errno);
    return readOpenFile(file.number(), path, limit);
}

// The temporary file has one name for each target. Writers of the same target take turns by a lock on it. One that a
// killed process left behind is used by the next writer, so that none pile up.
MaybeError replaceFile(const std::string& path, std::span<const std::uint8_t> content) {
    const std::string temporary = path + ".tmp";
    while (true) {
        OpenFile file(temporary.c_str(), O_WRONLY | O_CREAT | O_NOFOLLOW | O_NONBLOCK);
        if (!file) return systemError("create", temporary, errno);

        struct stat mine, named;
        if (lockFile(file.number()) != 0 || ::fstat(file.number(), &mine) != 0)
            return systemError("lock", temporary, errno);
        // Whoever held the lock before has renamed or removed the file by now: this is no longer the temporary one.
        if (::lstat(temporary.c_str(), &named) != 0) {
            if (errno == ENOENT) continue;
            return systemError("examine", temporary, errno);
        }
        if (mine.st_dev != named.st_dev || mine.st_ino != named.st_ino) continue;

        auto giveUp = [&](const char* what) {
            Error error = systemError(what, temporary, errno);
            ::unlink(temporary.c_str());
            return error;
        };
        if (::ftruncate(file.number(), 0) != 0) return giveUp("empty");
        if (!writeAll(file.number(), content)) return giveUp("write");
        if (::fsync(file.number()) != 0) return giveUp("sync");
        if (::rename(temporary.c_str(), path.c_str()) != 0) return giveUp("rename");
        return syncFolder(folderOf(path));
    }
}

MaybeError createDirectories(const std::string& path) {
    if (::mkdir(path.c_str(), 0700) == 0) return syncFolder(folderOf(path));
    if (errno == ENOENT && folderOf(path) != path) {
        if (MaybeError error = createDirectories(folderOf(path))) return error;
        if (::mkdir(path.c_str(), 0700) == 0) return syncFolder(folderOf(path));
    }
    if (errno != EEXIST) return systemError("create", path, errno);
    struct stat status;
    if (::stat(path.c_str(), &status) != 0) return systemError("examine", path, errno);
    if (!S_ISDIR(status.st_mode)) return systemError("create", path, ENOTDIR);
    return std::nullopt;
}

// The stamp is from before reading: a change in between shows at the next call.
Result<Value> KeptDocuments::read(const std::string& path) {
    constexpr std::size_t mostDocuments = 8;
    constexpr off_t mostBytes = 64 * 1024;  // decoded they are some times as large
    const FileStamp stamp = FileStamp::of(path);
    const bool isKept = stamp.inode != 0 && stamp.size <= mostBytes && stamp.isSettled();
    if (isKept) {
        const std::lock_guard lock(mutex_);
        const auto known = std::ranges::find(documents_, path, &Document::path);
        if (known != documents_.end() && known->stamp == stamp) return known->root;
    }
    const Result<FileContent> content = readFile(path);
    if (!content) return content.error();
    Result<Value> root = codec::parsePropertyList(content->bytes);
    if (!root || !isKept) return root;
    const std::lock_guard lock(mutex_);
    std::erase_if(documents_, [&](const Document& document) { return document.path == path; });
    if (documents_.size() == mostDocuments) documents_.pop_front();
    documents_.push_back({path, stamp, *root});
    return root;
}

Result<Data> Files::read(const std::string& path) const {
    Result<FileContent> content = readFile(path);
    if (!content) return content.error();
    return std::move(content).value().bytes;
}

MaybeError Files::replace(const std::string& path, const Data& content) {
    return replaceFile(path, content);
}

MaybeError Files::createDirectories(const std::string& path) {
    return host::createDirectories(path);
}

MaybeError Files::remove(const std::string& path) {
    if (::unlink(path.c_str()) != 0) return systemError("remove", path, errno);
    return syncFolder(folderOf(path));
}

}  // namespace vrx::host
