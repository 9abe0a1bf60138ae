// The agent's home directory and whole-file operations. Any thread may use it.
#pragma once

#include <string>

#include "vrx/platform/error.h"
#include "vrx/platform/value.h"

namespace vrx::platform {

class Files {
public:
    virtual ~Files() = default;
    // An absolute path without a slash at its end.
    virtual std::string homeDirectory() const = 0;
    // Reads the whole file. A file larger than limits::fileBytes is an error, and so is anything but a regular file.
    virtual Result<Data> read(const std::string& path) const = 0;
    // The root of the property list that the file is. What was decoded may be kept for as long as the file is the same.
    virtual Result<Value> readPropertyList(const std::string& path) const = 0;
    // Replaces the file as one step, or leaves it as it was: a reader, and the next start after a power cut, sees the
    // whole old or the whole new content. The directory must exist.
    virtual MaybeError replace(const std::string& path, const Data& content) = 0;
    // Creates the directory and the missing ones above it. A directory that exists is not an error.
    virtual MaybeError createDirectories(const std::string& path) = 0;
    virtual MaybeError remove(const std::string& path) = 0;
};

}  // namespace vrx::platform
