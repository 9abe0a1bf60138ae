#include "vrx/host/loop/file_watch.h"

#include <utility>

namespace vrx::host {

FileWatch::FileWatch(sd_event* loop, std::vector<std::string> paths, platform::Duration pause,
                     std::function<void()> onChange, FolderChanges::Notice notice)
    : pause_(pause), onChange_(std::move(onChange)), changes_(std::move(paths), notice) {
    pauseSource_ = addBootTimer(loop, onPause, this);
    if (changes_.file() >= 0) eventSource_ = addReadSource(loop, changes_.file(), onEvents, this);
}

void FileWatch::callIn(platform::Duration delay) {
    if (isPausing_) return;
    armTimer(pauseSource_, bootTime() + delay);
}

int FileWatch::onEvents(sd_event_source*, int, std::uint32_t, void* userdata) {
    auto& self = *static_cast<FileWatch*>(userdata);
    if (!self.changes_.take()) return 0;
    // The pause starts with the first change and is not prolonged by others, so that it ends.
    if (!std::exchange(self.isPausing_, true)) armTimer(self.pauseSource_, bootTime() + self.pause_);
    return 0;
}

int FileWatch::onPause(sd_event_source*, std::uint64_t, void* userdata) {
    auto& self = *static_cast<FileWatch*>(userdata);
    self.isPausing_ = false;
    self.onChange_();
    return 0;
}

}  // namespace vrx::host
