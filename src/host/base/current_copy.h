// A parsed copy of a file. Each read, but of a request only the first, compares the file's stamp with that of the copy,
// which takes half a microsecond, and parses the file again when they differ. Any thread may ask.
#pragma once

#include <functional>
#include <memory>
#include <mutex>
#include <string>

#include "vrx/host/base/file_stamp.h"
#include "vrx/host/base/files.h"
#include "vrx/host/base/request_scope.h"

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
        if (copy_ && !RequestScope::isFirstLook(this)) return copy_;
        const FileStamp stamp = FileStamp::of(path_);
        if (copy_ && isSettled_ && stamp == stamp_) return copy_;
        // The stamp is from before reading: a change in between shows at the next call.
        isSettled_ = stamp.isSettled();
        stamp_ = stamp;
        copy_ = parse_(readFile(path_), copy_);
        return copy_;
    }

private:
    const std::string path_;
    const Parse parse_;
    mutable std::mutex mutex_;
    mutable std::shared_ptr<const T> copy_;
    mutable FileStamp stamp_;
    mutable bool isSettled_ = false;
};

}  // namespace vrx::host
