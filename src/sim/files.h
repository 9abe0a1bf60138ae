// The files in memory. They survive a restart of the simulated process.
#pragma once

#include <deque>
#include <map>
#include <optional>
#include <set>
#include <string>
#include <string_view>
#include <vector>

#include "vrx/platform/files.h"
#include "vrx/sim/interference.h"

namespace vrx::sim {

class Files final : public platform::Files {
public:
    explicit Files(const Interference& interference);

    std::string homeDirectory() const override { return "/home/user"; }
    platform::Result<platform::Data> read(const std::string& path) const override;
    platform::Result<platform::Value> readPropertyList(const std::string& path) const override;
    platform::MaybeError replace(const std::string& path, const platform::Data& content) override;
    platform::MaybeError createDirectories(const std::string& path) override;
    platform::MaybeError remove(const std::string& path) override;

    // For tests, regardless of scripted faults: puts a file in place and makes the directories that it needs.
    void put(const std::string& path, std::string_view content);
    std::optional<std::string> content(const std::string& path) const;
    bool contains(const std::string& path) const { return files_.contains(path) || directories_.contains(path); }
    // Every file, in the order of the paths.
    std::vector<std::string> paths() const;
    // The files that were replaced, in order.
    const std::vector<std::string>& written() const { return written_; }
    void forgetWritten() { written_.clear(); }

    enum class Operation { Read, Replace, CreateDirectories, Remove };
    // The next calls of the operation fail with an errno, such as ENOSPC, and change nothing.
    void fail(Operation operation, int error, int count = 1);
    bool isFailing() const;
    // The next replace() gets as far as a power cut before its last step: the old file is still there, and beside it
    // the new content. A real process would have ended there; here the call returns an error.
    void crashNextReplace() { crashesNextReplace_ = true; }

private:
    platform::MaybeError scriptedFault(Operation operation, const std::string& path) const;
    void addDirectories(const std::string& path);

    const Interference& interference_;
    std::map<std::string, platform::Data> files_;
    std::set<std::string> directories_;
    std::vector<std::string> written_;
    mutable std::map<Operation, std::deque<int>> faults_;
    bool crashesNextReplace_ = false;
};

}  // namespace vrx::sim
