// Whole-file operations. A file of the home is replaced by replaceFile() alone. Any number of threads and processes may
// use them at once.
#pragma once

#include <sys/stat.h>
#include <sys/types.h>

#include <span>
#include <string>
#include <string_view>

#include "vrx/platform/files.h"

namespace vrx::host {

// The system calls used here, as their manual pages describe them. A test overrides one to make it fail.
class FileCalls {
public:
    virtual ~FileCalls() = default;
    virtual int open(const char* path, int flags, mode_t mode);
    virtual int close(int file);
    virtual ssize_t read(int file, void* buffer, std::size_t size);
    virtual ssize_t write(int file, const void* bytes, std::size_t size);
    virtual int lock(int file);  // flock, exclusive
    virtual int truncate(int file);
    virtual int sync(int file);
    virtual int status(int file, struct stat* status);
    virtual int status(const char* path, struct stat* status);
    virtual int rename(const char* from, const char* to);
    virtual int remove(const char* path);
    virtual int makeDirectory(const char* path, mode_t mode);

    static FileCalls& system();
};

// A file's content, and its status at the time of reading.
struct FileContent {
    platform::Data bytes;
    struct stat status;
    std::string_view text() const { return {reinterpret_cast<const char*>(bytes.data()), bytes.size()}; }
};

// Reads a regular file of at most limits::fileBytes. Anything else is an error. Never blocks, not even on a FIFO.
platform::Result<FileContent> readFile(const std::string& path, FileCalls& calls = FileCalls::system());

// Replaces or creates the file, with mode 0600. After success it holds the whole new content, also after a power cut;
// after an error it holds the old one. Only when the last step fails, making the new name durable, may the new content
// be there although an error is returned.
platform::MaybeError replaceFile(const std::string& path, std::span<const std::uint8_t> content,
                                 FileCalls& calls = FileCalls::system());

// Creates the directory and the missing ones above it, with mode 0700.
platform::MaybeError createDirectories(const std::string& path, FileCalls& calls = FileCalls::system());

// The error of a failed system call: "cannot WHAT PATH: REASON", with errno as its code.
platform::Error systemError(const std::string& what, const std::string& path, int number);

class Files final : public platform::Files {
public:
    explicit Files(std::string homeDirectory, FileCalls& calls = FileCalls::system())
        : homeDirectory_(std::move(homeDirectory)), calls_(calls) {}

    std::string homeDirectory() const override { return homeDirectory_; }
    platform::Result<platform::Data> read(const std::string& path) const override;
    platform::MaybeError replace(const std::string& path, const platform::Data& content) override;
    platform::MaybeError createDirectories(const std::string& path) override;
    platform::MaybeError remove(const std::string& path) override;

private:
    const std::string homeDirectory_;
    FileCalls& calls_;
};

}  // namespace vrx::host
