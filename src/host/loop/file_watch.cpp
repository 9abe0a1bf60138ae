#include "vrx/host/loop/file_watch.h"

#include <sys/inotify.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <cstdlib>
#include <cstring>
#include <filesystem>

#include "vrx/platform/log.h"

namespace vrx::host {

namespace {

std::string folderOf(const std::string& path) {
    const std::size_t slash = path.rfind('/');
    if (slash == std::string::npos) return ".";
    return slash == 0 ? "/" : path.substr(0, slash);
}

std::string resolved(const std::string& path) {
    const std::unique_ptr<char, decltype(&std::free)> real(realpath(path.c_str(), nullptr), &std::free);
    return real ? real.get() : path;
}

}  // namespace

FileWatch::FileWatch(sd_event* loop, std::vector<std::string> paths, platform::Duration pause,
                     std::function<void()> onChange)
    : paths_(std::move(paths)),
      pause_(pause),
      onChange_(std::move(onChange)),
      file_(inotify_init1(IN_NONBLOCK | IN_CLOEXEC)) {
    pauseSource_ = addBootTimer(loop, onPause, this);
    if (!file_) {  // the user's limit of inotify instances is reached
        log(platform::Level::Error, "Changes of %@ go unnoticed: %@", paths_.front(), std::strerror(errno));
        return;
    }
    watchFolders();
    eventSource_ = addReadSource(loop, file_.number(), onEvents, this);
}

void FileWatch::callIn(platform::Duration delay) {
    if (isPausing_) return;
    armTimer(pauseSource_, bootTime() + delay);
}

// Done anew after each event: links and missing folders change which folders there are.
void FileWatch::watchFolders() {
    std::set<int> watches;
    for (const std::string& path : paths_) addFolders(path, watches);
    for (const int number : watches_)
        if (!watches.contains(number)) inotify_rm_watch(file_.number(), number);
    watches_ = std::move(watches);
}

// A folder reports its own removal. That it appears, or that a link to it changes, is reported by the folder above,
// which is watched for nothing else because it may be busy.
void FileWatch::addFolders(const std::string& path, std::set<int>& watches) const {
    constexpr std::uint32_t coming = IN_CREATE | IN_MOVED_TO;
    constexpr std::uint32_t anything =
        coming | IN_CLOSE_WRITE | IN_ATTRIB | IN_DELETE | IN_MOVED_FROM | IN_DELETE_SELF | IN_MOVE_SELF;
    auto add = [&](const std::string& place, std::uint32_t events) {
        const int number = inotify_add_watch(file_.number(), place.c_str(), events | IN_ONLYDIR | IN_MASK_ADD);
        if (number >= 0) watches.insert(number);
        return number >= 0;
    };
    const std::string folder = folderOf(path);
    std::error_code none;
    if (!add(folder, anything) || std::filesystem::is_symlink(folder, none)) {
        add(folderOf(folder), coming);
        add(folder, anything);  // it may have appeared meanwhile
    }
    add(folderOf(resolved(path)), anything);
}

// Ignores what exactly happened: some events may have been lost.
int FileWatch::onEvents(sd_event_source*, int file, std::uint32_t, void* userdata) {
    alignas(inotify_event) std::array<char, 16384> events;
    while (read(file, events.data(), events.size()) > 0) {
    }
    auto& self = *static_cast<FileWatch*>(userdata);
    self.watchFolders();
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
