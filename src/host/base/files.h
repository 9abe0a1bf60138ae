// Whole-file operations. A file of the home is replaced by replaceFile() alone. Any number of threads and processes may
// use them at once.
#pragma once

#include <sys/stat.h>
#include <sys/types.h>

#include <cerrno>
#include <cstddef>
#include <deque>
#include <mutex>
#include <span>
#include <string>
#include <string_view>

#include "vrx/host/base/descriptor.h"
#include "vrx/host/base/file_stamp.h"
#include "vrx/platform/files.h"
#include "vrx/platform/limits.h"

namespace vrx::host {

// A file's content, and its status at the time of reading.
struct FileContent {
    platform::Data bytes;
    struct stat status;
    std::string_view text() const { return {reinterpret_cast<const char*>(bytes.data()), bytes.size()}; }
};

// Reads a regular file of at most that many bytes. Anything else is an error. Never blocks, not even on a FIFO.
platform::Result<FileContent> readFile(const std::string& path, std::size_t limit = platform::limits::fileBytes);
// The same, by a relative path that starts at the open folder; its last part must be no link.
platform::Result<FileContent> readFileIn(const Descriptor& folder, const std::string& path, std::size_t limit);

// Replaces or creates the file, with mode 0600. After success it holds the whole new content, also after a power cut;
// after an error it holds the old one. Only when the last step fails, making the new name durable, may the new content
// be there although an error is returned.
platform::MaybeError replaceFile(const std::string& path, std::span<const std::uint8_t> content);

// Creates the directory and the missing ones above it, with mode 0700.
platform::MaybeError createDirectories(const std::string& path);

// The error of a failed system call: "cannot WHAT PATH: REASON", with errno as its code.
platform::Error systemError(const std::string& what, const std::string& path, int number);

// Whether the call failed because there was no descriptor or memory left, which says nothing about what it was for.
constexpr bool isShortage(int number) {
    return number == EMFILE || number == ENFILE || number == ENOMEM || number == ENOBUFS;
}

// What was decoded of small property lists, the last few, while they are unchanged. Any thread may ask.
class KeptDocuments {
public:
    platform::Result<platform::Value> read(const std::string& path);

private:
    struct Document {
        std::string path;
        FileStamp stamp;
        platform::Value root;
    };
    std::mutex mutex_;
    std::deque<Document> documents_;  // the one decoded last at the end
};

class Files final : public platform::Files {
public:
    explicit Files(std::string homeDirectory) : homeDirectory_(std::move(homeDirectory)) {}

    std::string homeDirectory() const override { return homeDirectory_; }
    platform::Result<platform::Data> read(const std::string& path) const override;
    platform::Result<platform::Value> readPropertyList(const std::string& path) const override {
        return documents_.read(path);
    }
    platform::MaybeError replace(const std::string& path, const platform::Data& content) override;
    platform::MaybeError createDirectories(const std::string& path) override;
    platform::MaybeError remove(const std::string& path) override;

private:
    const std::string homeDirectory_;
    mutable KeptDocuments documents_;
};

}  // namespace vrx::host
