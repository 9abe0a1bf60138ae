// Whether some files and folders may have changed since the last question: a file was written in place, replaced or
// removed, or came or went with its folder. It watches folders, because editors replace files by renaming. A folder
// that is missing is waited for in the nearest one above it. A question costs one system call. One thread at a time.
#pragma once

#include <cstdint>
#include <set>
#include <string>
#include <vector>

#include "vrx/host/base/descriptor.h"

namespace vrx::host {

class FolderChanges {
public:
    // A change is noticed when the file is closed, or with each write, as of files that stay open.
    enum class Notice : std::uint8_t { Closing, Writing };
    // A path that ends in "/" is a folder with everything in it; any other is a file.
    explicit FolderChanges(std::vector<std::string> paths, Notice notice = Notice::Closing);

    // Whether there may have been a change since the last call. True always when nothing can be watched.
    bool take();
    // Readable when take() may return true. None, -1, when nothing can be watched.
    int file() const { return file_.number(); }

private:
    void watchFolders();
    void addFile(const std::string& path);
    void addFolder(const std::string& path);
    bool watch(const std::string& folder, std::uint32_t events);
    bool add(const std::string& folder, std::uint32_t events);

    const std::vector<std::string> paths_;
    const std::uint32_t anything_;  // of inotify's events
    Descriptor file_;
    std::set<int> watches_;
    std::set<int> fullWatches_;  // those among them of whose folder every change counts
};

}  // namespace vrx::host
