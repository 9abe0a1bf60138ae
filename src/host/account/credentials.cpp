#include "vrx/host/account/credentials.h"

#include <unistd.h>

#include <algorithm>
#include <cerrno>

#include "vrx/host/base/files.h"
#include "vrx/host/base/secret.h"
#include "vrx/platform/log.h"
#include "vrx/platform/sha256_hash.h"

namespace vrx::host {

using platform::Level;
using platform::MaybeError;
using platform::Result;

bool isToken(std::string_view text) {
    constexpr std::size_t longest = 8192;
    return !text.empty() && text.size() <= longest &&
           std::ranges::all_of(text, [](char c) { return c > ' ' && c < '\x7f'; });
}

std::string Credentials::pathOf(const std::string& account, std::string_view service) const {
    return folder_ + "/" + platform::sha256Hash(account + "\n" + std::string(service));
}

std::optional<std::string> Credentials::token(const std::string& account, std::string_view service) const {
    const std::string path = pathOf(account, service);
    Result<FileContent> file = readFile(path);
    if (!file) {
        if (file.error().code != ENOENT) log(Level::Error, "%@", file.error());
        return std::nullopt;
    }
    const struct stat status = file->status;
    const Secret content(std::move(file).value().bytes);
    if (status.st_uid != geteuid() || (status.st_mode & 0077) != 0) {
        log(Level::Error, "The credential %@ is not used: it must belong to the agent's user, and be its alone", path);
        return std::nullopt;
    }
    std::string_view token = content.text();
    if (token.ends_with('\n')) token.remove_suffix(1);  // written by hand
    if (isToken(token)) return std::string(token);
    log(Level::Error, "The credential %@ is not used: it holds no token", path);
    return std::nullopt;
}

MaybeError Credentials::store(const std::string& account, std::string_view service, std::string_view token) {
    if (MaybeError error = createDirectories(folder_)) return error;
    return replaceFile(pathOf(account, service), {reinterpret_cast<const std::uint8_t*>(token.data()), token.size()});
}

}  // namespace vrx::host
