// What the host's tests share: a folder that goes away, a clock that the test sets, and a platform that writes down
// what is logged.
#pragma once

#include <gtest/gtest.h>

#include <atomic>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <mutex>
#include <string>
#include <vector>

#include "vrx/codec/codec.h"
#include "vrx/platform/clock.h"
#include "vrx/platform/log.h"
#include "vrx/platform/platform.h"

namespace vrx::host {

class TemporaryFolder {
public:
    TemporaryFolder() {
        std::string pattern = (std::filesystem::temp_directory_path() / "vrx-XXXXXX").string();
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

private:
    std::string path_;
};

inline void writeFile(const std::string& path, std::string_view text) {
    std::ofstream(path, std::ios::binary) << text;
}

inline std::string fileText(const std::string& path) {
    std::ifstream file(path, std::ios::binary);
    return {std::istreambuf_iterator<char>(file), {}};
}

class SettableClock final : public platform::Clock {
public:
    platform::Date now() const override { return platform::dateFromEpoch(seconds); }
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

}  // namespace vrx::host
