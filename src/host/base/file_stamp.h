// What tells that a file is still the one that was read: its identity, size and times.
#pragma once

#include <sys/stat.h>

#include <cstdint>
#include <ctime>
#include <string>

namespace vrx::host {

struct FileStamp {
    dev_t device = 0;
    ino_t inode = 0;
    off_t size = 0;
    std::int64_t modified = 0;
    std::int64_t changed = 0;  // also when owner or mode change
    bool operator==(const FileStamp&) const = default;

    // All 0 for a missing file.
    static FileStamp of(const std::string& path) {
        struct stat status;
        if (stat(path.c_str(), &status) != 0) return {};
        return {status.st_dev, status.st_ino, status.st_size, nanoseconds(status.st_mtim), nanoseconds(status.st_ctim)};
    }
    // Whether a later change must show in the stamp. Not so for a file that changed within the last tick of the clock:
    // a second change in the same tick would not show. True for a missing file.
    bool isSettled() const {
        constexpr std::int64_t tick = 20'000'000;
        timespec now{};
        clock_gettime(CLOCK_REALTIME_COARSE, &now);
        const std::int64_t age = nanoseconds(now) - changed;
        return age > tick || age < -tick;
    }

private:
    static std::int64_t nanoseconds(const timespec& time) {
        return std::int64_t{time.tv_sec} * 1'000'000'000 + time.tv_nsec;
    }
};

}  // namespace vrx::host
