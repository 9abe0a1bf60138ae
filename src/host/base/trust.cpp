#include "vrx/host/base/trust.h"

#include <unistd.h>

#include <cerrno>
#include <filesystem>
#include <list>

#include "vrx/host/base/files.h"

namespace vrx::host {

using platform::Error;

namespace {

std::optional<uid_t> agentUser;

constexpr int mostLinks = 40;

bool isOwnedByOthers(const struct stat& status) {
    return status.st_uid != 0 && status.st_uid != agentUser.value_or(geteuid());
}

OpenToOthers openToOthers(const std::string& path) {
    return {path, Error{platform::error_domain::bundle, EPERM,
                        path + " can be changed by others than root and the agent's user"}};
}

OpenToOthers unknown(const std::string& path, int number) {
    return {path, systemError("examine", path, number)};
}

}  // namespace

std::optional<OpenToOthers> findOpenToOthers(const std::string& path, const struct stat& status) {
    const bool isSticky = S_ISDIR(status.st_mode) && (status.st_mode & S_ISVTX) != 0;
    const bool isWritable = (status.st_mode & (S_IWGRP | S_IWOTH)) != 0 && !isSticky;
    if (isOwnedByOthers(status) || isWritable) return openToOthers(path);
    return std::nullopt;
}

// Walks down from the root, as the kernel does. `reached` is kept from others and contains no link, so its parent is
// the folder above it by name, too.
std::optional<OpenToOthers> findOpenToOthers(const std::string& path, Links links) {
    std::error_code error;
    const std::filesystem::path whole = std::filesystem::absolute(path, error);
    if (error) return unknown(path, error.value());
    std::list<std::filesystem::path> rest(whole.begin(), whole.end());
    std::filesystem::path reached;
    for (int linksFollowed = 0; !rest.empty(); rest.pop_front()) {
        const std::filesystem::path& part = rest.front();
        if (part.empty() || part == ".") continue;
        if (part == "/" || part == "..") {
            reached = part == "/" ? part : reached.parent_path();
            continue;
        }
        const std::filesystem::path next = reached / part;
        struct stat status;
        if (lstat(next.c_str(), &status) != 0) return unknown(next, errno);
        if (!S_ISLNK(status.st_mode)) {
            if (auto open = findOpenToOthers(next.string(), status)) return open;
            reached = next;
            continue;
        }
        if (links == Links::Refused || isOwnedByOthers(status)) return openToOthers(next);
        if (++linksFollowed > mostLinks) return unknown(next, ELOOP);
        const std::filesystem::path target = std::filesystem::read_symlink(next, error);
        if (error) return unknown(next, error.value());
        rest.insert(std::next(rest.begin()), target.begin(), target.end());
    }
    return std::nullopt;
}

void judgeAsAgentOf(uid_t user) {
    agentUser = user;
}

}  // namespace vrx::host
