#include "vrx/sim/files.h"

#include <algorithm>
#include <cerrno>
#include <cstring>

#include "vrx/codec/property_list.h"
#include "vrx/platform/limits.h"

namespace vrx::sim {

using platform::Data;
using platform::Error;
using platform::MaybeError;
using platform::Result;
using platform::Value;

namespace {

std::string folderOf(const std::string& path) {
    std::size_t slash = path.rfind('/');
    return slash == 0 || slash == std::string::npos ? "/" : path.substr(0, slash);
}

Error fileError(const char* what, const std::string& path, int number) {
    return Error{platform::error_domain::system, number,
                 std::string("cannot ") + what + " " + path + ": " + std::strerror(number)};
}

}  // namespace

Files::Files(const Interference& interference) : interference_(interference) {
    addDirectories(homeDirectory());
}

Result<Data> Files::read(const std::string& path) const {
    if (MaybeError fault = scriptedFault(Operation::Read, path)) return *fault;
    if (directories_.contains(path)) return fileError("read", path, EINVAL);
    auto file = files_.find(path);
    if (file == files_.end()) return fileError("open", path, ENOENT);
    if (file->second.size() > platform::limits::fileBytes) return fileError("read", path, EFBIG);
    return file->second;
}

Result<Value> Files::readPropertyList(const std::string& path) const {
    const Result<Data> document = read(path);
    return document ? codec::parsePropertyList(*document) : document.error();
}

MaybeError Files::replace(const std::string& path, const Data& content) {
    if (MaybeError fault = scriptedFault(Operation::Replace, path)) return fault;
    if (!directories_.contains(folderOf(path))) return fileError("create", path, ENOENT);
    if (directories_.contains(path)) return fileError("rename", path, EISDIR);
    if (crashesNextReplace_) {
        crashesNextReplace_ = false;
        files_[path + ".tmp"] = content;
        return fileError("rename", path, EIO);
    }
    files_[path] = content;
    if (interference_.strikes(Defect::FileTorn)) files_[path].resize(content.size() / 2);
    written_.push_back(path);
    return std::nullopt;
}

MaybeError Files::createDirectories(const std::string& path) {
    if (MaybeError fault = scriptedFault(Operation::CreateDirectories, path)) return fault;
    for (std::string folder = path; folder != "/"; folder = folderOf(folder))
        if (files_.contains(folder)) return fileError("create", path, ENOTDIR);
    addDirectories(path);
    return std::nullopt;
}

MaybeError Files::remove(const std::string& path) {
    if (MaybeError fault = scriptedFault(Operation::Remove, path)) return fault;
    if (directories_.contains(path)) return fileError("remove", path, EISDIR);
    if (files_.erase(path) == 0) return fileError("remove", path, ENOENT);
    return std::nullopt;
}

void Files::put(const std::string& path, std::string_view content) {
    addDirectories(folderOf(path));
    files_[path] = Data(content.begin(), content.end());
}

std::optional<std::string> Files::content(const std::string& path) const {
    auto file = files_.find(path);
    if (file == files_.end()) return std::nullopt;
    return std::string(file->second.begin(), file->second.end());
}

std::vector<std::string> Files::paths() const {
    std::vector<std::string> paths;
    for (const auto& [path, content] : files_) paths.push_back(path);
    return paths;
}

void Files::fail(Operation operation, int error, int count) {
    faults_[operation].insert(faults_[operation].end(), static_cast<std::size_t>(count), error);
}

bool Files::isFailing() const {
    return crashesNextReplace_ || std::ranges::any_of(faults_, [](const auto& entry) { return !entry.second.empty(); });
}

MaybeError Files::scriptedFault(Operation operation, const std::string& path) const {
    interference_.call();
    constexpr const char* names[] = {"read", "replace", "create", "remove"};
    std::deque<int>& faults = faults_[operation];
    if (faults.empty()) return std::nullopt;
    int number = faults.front();
    faults.pop_front();
    return fileError(names[static_cast<int>(operation)], path, number);
}

void Files::addDirectories(const std::string& path) {
    directories_.insert("/");
    for (std::string folder = path; folder != "/"; folder = folderOf(folder)) directories_.insert(folder);
}

}  // namespace vrx::sim
