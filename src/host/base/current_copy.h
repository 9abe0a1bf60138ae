// A parsed copy of a file. Each read compares the file's identity, size and times with those of the copy, which takes
// half a microsecond, and parses the file again when they differ. A file that changed within the last tick of the clock
// is read again at each call: a second change in the same tick would not show. Any thread may ask.
#pragma once

#include <sys/stat.h>

#include <ctime>
#include <functional>
#include <memory>
#include <mutex>
#include <string>

#include "vrx/host/base/files.h"

namespace vrx::host {

template <class T>
class CurrentCopy {
public:
    // Takes the file as it was read, or the error, and the copy so far, null at first. Never returns null.
    using Parse = std::function<std::shared_ptr<const T>(const platform::Result<FileContent>& file,
                                                         std::shared_ptr<const T> last)>;

    CurrentCopy(std::string path, Parse parse) : path_(std::move(path)), parse_(std::move(parse)) {}

    const std::string& path() const { return path_; }

    std::shared_ptr<const T> get() const {
        std::lock_guard lock(mutex_);
        Stamp stamp = Stamp::of(path_);
        if (copy_ && isSettled_ && stamp == stamp_) return copy_;
        // The stamp is from before reading: a change in between shows at the next call.
        isSettled_ = stamp.isSettled();
        stamp_ = stamp;
        copy_ = parse_(readFile(path_), copy_);
        return copy_;
    }

private:
    struct Stamp {
        dev_t device = 0;
        ino_t inode = 0;
        off_t size = 0;
        std::int64_t modified = 0;
        std::int64_t changed = 0;  // also when owner or mode change
        bool operator==(const Stamp&) const = default;

        static std::int64_t nanoseconds(const timespec& time) {
            return std::int64_t{time.tv_sec} * 1'000'000'000 + time.tv_nsec;
        }
        static Stamp of(const std::string& path) {
            struct stat status;
            if (stat(path.c_str(), &status) != 0) return {};
            return {status.st_dev, status.st_ino, status.st_size, nanoseconds(status.st_mtim),
                    nanoseconds(status.st_ctim)};
        }
        // Whether a later change must show in the stamp. True for a missing file.
        bool isSettled() const {
            constexpr std::int64_t tick = 20'000'000;
            timespec now{};
            clock_gettime(CLOCK_REALTIME_COARSE, &now);
            const std::int64_t age = nanoseconds(now) - changed;
            return age > tick || age < -tick;
        }
    };

    const std::string path_;
    const Parse parse_;
    mutable std::mutex mutex_;
    mutable std::shared_ptr<const T> copy_;
    mutable Stamp stamp_;
    mutable bool isSettled_ = false;
};

}  // namespace vrx::host
