// What the host's tests share: a folder that goes away, child processes and pipes, a clock that the test sets, and a
// platform that writes down what is logged.
#pragma once

#include <fcntl.h>
#include <sys/wait.h>
#include <unistd.h>

#include <array>
#include <atomic>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <mutex>
#include <string>
#include <vector>

#include "support/values.h"
#include "vrx/codec/codec.h"
#include "vrx/codec/property_list.h"
#include "vrx/host/base/descriptor.h"
#include "vrx/platform/clock.h"
#include "vrx/platform/log.h"
#include "vrx/platform/platform.h"

namespace vrx::host {

// Under the address or the thread sanitizer.
#if defined(__SANITIZE_ADDRESS__) || defined(__SANITIZE_THREAD__)
inline constexpr bool isSanitized = true;
#elif defined(__has_feature)
inline constexpr bool isSanitized = __has_feature(address_sanitizer) || __has_feature(thread_sanitizer);
#else
inline constexpr bool isSanitized = false;
#endif

class TemporaryFolder {
public:
    TemporaryFolder() {
        std::string pattern = std::filesystem::canonical(std::filesystem::temp_directory_path()) / "vrx-XXXXXX";
        path_ = mkdtemp(pattern.data());
    }
    ~TemporaryFolder() { std::filesystem::remove_all(path_); }
    TemporaryFolder(const TemporaryFolder&) = delete;
    TemporaryFolder& operator=(const TemporaryFolder&) = delete;

    const std::string& path() const { return path_; }
    std::string operator/(const std::string& name) const { return path_ + "/" + name; }
    std::vector<std::string> names() const {
        std::vector<std::string> names;
        for (const auto& entry : std::filesystem::directory_iterator(path_)) names.push_back(entry.path().filename());
        std::sort(names.begin(), names.end());
        return names;
    }
    void setMode(const std::string& name, unsigned mode) const {
        std::filesystem::permissions(*this / name, std::filesystem::perms(mode));
    }

private:
    std::string path_;
};

inline Data bytes(std::string_view text) {
    return {text.begin(), text.end()};
}

// Makes the folders above it too.
inline void writeFile(const std::filesystem::path& path, std::string_view text) {
    std::filesystem::create_directories(path.parent_path());
    std::ofstream(path, std::ios::binary) << text;
}

inline std::string fileText(const std::string& path) {
    std::ifstream file(path, std::ios::binary);
    return {std::istreambuf_iterator<char>(file), {}};
}

// What a folder's files hold, and when each was written; without the index that a database's readers share.
inline Dictionary contentsOf(const std::string& folder) {
    Dictionary contents;
    for (const auto& entry : std::filesystem::recursive_directory_iterator(folder))
        if (entry.is_regular_file() && !entry.path().string().ends_with("-shm"))
            contents[entry.path()] = Array{fileText(entry.path()), entry.last_write_time().time_since_epoch().count()};
    return contents;
}

// A property list in XML.
inline std::string propertyList(const Dictionary& entries) {
    const auto written = codec::serializePropertyList(entries, platform::PropertyListFormat::Xml);
    return {written->begin(), written->end()};
}

inline unsigned modeOf(const std::string& path) {
    return static_cast<unsigned>(std::filesystem::status(path).permissions());
}

// A child process that does the work and ends without any clean-up. It must be made before this process has threads.
template <class Work>
pid_t inChild(Work work) {
    const pid_t child = fork();
    if (child != 0) return child;
    work();
    _exit(0);
}

// Its exit code, or the negative signal that ended it, once it has ended.
inline int endOf(pid_t child) {
    int status = 0;
    waitpid(child, &status, 0);
    return WIFEXITED(status) ? WEXITSTATUS(status) : -WTERMSIG(status);
}

struct Pipe {
    Pipe() {
        std::array<int, 2> ends{};
        if (pipe2(ends.data(), O_CLOEXEC) != 0) std::abort();
        reader = Descriptor(ends[0]);
        writer = Descriptor(ends[1]);
    }
    // Everything that comes until nobody can write any longer; this process cannot from now on.
    std::string rest() {
        writer = Descriptor();
        std::string text;
        std::array<char, 4096> piece;
        for (ssize_t size; (size = read(reader.number(), piece.data(), piece.size())) > 0;)
            text.append(piece.data(), static_cast<std::size_t>(size));
        return text;
    }
    Descriptor reader, writer;
};

class SettableClock final : public platform::Clock {
public:
    Date now() const override { return dateFromEpoch(seconds); }
    std::chrono::seconds timeZoneOffset() const override { return {}; }
    std::atomic<double> seconds = 784'111'777;  // 1994-11-06 08:49:37
};

// The current platform, with nothing but digests, and a log that keeps its lines of level Default and above.
class LogRecorder final : public platform::SystemLog {
public:
    bool isOn(platform::Level level) const override { return level != platform::Level::Debug; }
    void write(const platform::LogEntry& entry) override {
        std::lock_guard lock(mutex_);
        lines_.push_back(entry.message());
    }
    std::vector<std::string> lines() const {
        std::lock_guard lock(mutex_);
        return lines_;
    }

private:
    mutable std::mutex mutex_;
    std::vector<std::string> lines_;
    codec::Digest digest_;
    platform::Platform platform_{{.digest = &digest_, .systemLog = this}};
    platform::ScopedPlatform current_{platform_};
};

// A test that has a folder and sees what is logged.
class InFolder : public testing::Test {
protected:
    LogRecorder log;
    TemporaryFolder folder;
};

}  // namespace vrx::host
