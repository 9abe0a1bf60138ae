// Calls when one of some files may have changed (folder_changes.h), after a short pause, so that a row of changes makes
// one call. Costs nothing while nothing happens. Main thread.
#pragma once

#include <functional>
#include <string>
#include <vector>

#include "vrx/host/loop/event_source.h"
#include "vrx/host/loop/folder_changes.h"
#include "vrx/platform/date.h"

namespace vrx::host {

class FileWatch {
public:
    // A file need not exist, nor its folder; a path that ends in "/" is a folder with all in it. The event loop must
    // outlive the watch.
    FileWatch(sd_event* loop, std::vector<std::string> paths, platform::Duration pause, std::function<void()> onChange,
              FolderChanges::Notice notice = FolderChanges::Notice::Closing);
    FileWatch(const FileWatch&) = delete;
    FileWatch& operator=(const FileWatch&) = delete;

    // Calls after the delay as if something had changed, or sooner if something does.
    void callIn(platform::Duration delay);

private:
    static int onEvents(sd_event_source*, int file, std::uint32_t, void* self);
    static int onPause(sd_event_source*, std::uint64_t, void* self);

    const platform::Duration pause_;
    const std::function<void()> onChange_;
    FolderChanges changes_;
    EventSource eventSource_;
    EventSource pauseSource_;
    bool isPausing_ = false;
};

}  // namespace vrx::host
