#include "vrx/host/loop/folder_changes.h"

#include <sys/inotify.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <cstdlib>
#include <cstring>
#include <filesystem>
#include <memory>

#include "vrx/platform/log.h"

namespace vrx::host {

namespace {

constexpr std::uint32_t coming = IN_CREATE | IN_MOVED_TO;
constexpr std::uint32_t anything =
    coming | IN_CLOSE_WRITE | IN_ATTRIB | IN_DELETE | IN_MOVED_FROM | IN_DELETE_SELF | IN_MOVE_SELF;

std::string folderOf(const std::string& path) {
    const std::size_t slash = path.rfind('/');
    if (slash == std::string::npos) return ".";
    return slash == 0 ? "/" : path.substr(0, slash);
}

std::string resolved(const std::string& path) {
    const std::unique_ptr<char, decltype(&std::free)> real(realpath(path.c_str(), nullptr), &std::free);
    return real ? real.get() : path;
}

bool isLink(const std::string& path) {
    std::error_code none;
    return std::filesystem::is_symlink(path, none);
}

}  // namespace

FolderChanges::FolderChanges(std::vector<std::string> paths, Notice notice)
    : paths_(std::move(paths)),
      anything_(anything | (notice == Notice::Writing ? IN_MODIFY : 0u)),
      file_(inotify_init1(IN_NONBLOCK | IN_CLOEXEC)) {
    if (file_)
        watchFolders();
    else  // the user's limit of inotify instances is reached
        log(platform::Level::Error, "Changes of %@ cannot be watched: %@", paths_.front(), std::strerror(errno));
}

// Of a folder that is watched only for one to appear in it, what does not change the watches does not count: it may be
// busy. What exactly happened elsewhere is ignored, because some events may have been lost.
bool FolderChanges::take() {
    if (!file_) return true;
    alignas(inotify_event) std::array<char, 16384> events;
    bool isAny = false, isChanged = false;
    for (ssize_t size; (size = read(file_.number(), events.data(), events.size())) > 0;) {
        isAny = true;
        for (ssize_t at = 0; at < size;) {
            inotify_event event;
            std::memcpy(&event, events.data() + at, sizeof event);
            isChanged = isChanged || event.wd < 0 || fullWatches_.contains(event.wd);
            at += static_cast<ssize_t>(sizeof event + event.len);
        }
    }
    if (!isAny) return false;
    const std::set<int> before = watches_;
    watchFolders();
    return isChanged || watches_ != before;
}

// Done anew after each event: links and missing folders change which folders there are.
void FolderChanges::watchFolders() {
    const std::set<int> before = std::exchange(watches_, {});
    fullWatches_.clear();
    for (const std::string& path : paths_) path.ends_with('/') ? addFolder(path) : addFile(path);
    for (const int number : before)
        if (!watches_.contains(number)) inotify_rm_watch(file_.number(), number);
}

// A folder reports its own removal. That it appears, or that a link to it changes, is reported by the folder above.
void FolderChanges::addFile(const std::string& path) {
    const std::string folder = folderOf(path);
    if (isLink(folder)) add(folderOf(folder), coming);
    watch(folder, anything_);
    if (const std::string real = resolved(path); real != path) add(folderOf(real), anything_);
}

void FolderChanges::addFolder(const std::string& path) {
    addFile(path + "file");
    std::error_code error;
    for (std::filesystem::directory_iterator entry(path, error), end; !error && entry != end; entry.increment(error))
        if (isLink(entry->path())) add(folderOf(resolved(entry->path())), anything_);
}

// Watches the folder, or while it is missing the nearest one above it. Returns whether it is there.
bool FolderChanges::watch(const std::string& folder, std::uint32_t events) {
    if (add(folder, events)) return true;
    if (folder == "/" || folder == ".") return false;
    watch(folderOf(folder), coming);
    return add(folder, events);  // it may have appeared meanwhile
}

bool FolderChanges::add(const std::string& folder, std::uint32_t events) {
    const int number = inotify_add_watch(file_.number(), folder.c_str(), events | IN_ONLYDIR | IN_MASK_ADD);
    if (number < 0) return false;
    watches_.insert(number);
    if (events == anything_) fullWatches_.insert(number);
    return true;
}

}  // namespace vrx::host
