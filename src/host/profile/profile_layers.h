// The files that make up the device profile. Each read returns what they say now, read as one. A file that cannot be
// understood is reported once, with its line, and its last good state stays. Any thread may ask.
#pragma once

#include <memory>
#include <mutex>
#include <string>
#include <vector>

#include "vrx/host/loop/folder_changes.h"
#include "vrx/host/profile/profile_content.h"

namespace vrx::host {

struct ProfileDocument;

class ProfileLayers {
public:
    // The lowest first. A path that ends in "/" is a folder of drop-ins: its *.toml files, by name. Any other is a
    // file. None need exist.
    explicit ProfileLayers(std::vector<std::string> paths);
    ~ProfileLayers();

    const std::vector<std::string>& paths() const { return paths_; }

    // Never null. As long as nothing has changed it is the same object.
    std::shared_ptr<const ProfileContent> content() const;

    // What is wrong with a file. The text begins with a path, and with a line where there is one.
    struct Problem {
        enum class Kind { Mistake, Warning, OpenToOthers };  // only a mistake keeps a file from being taken over
        Kind kind;
        std::string text;
    };
    std::vector<Problem> problems() const;
    // Every key with its value in force (mergedKeys()).
    std::vector<ProfileKey> keys() const;
    // The files that were found and understood, the lowest first.
    std::vector<std::string> files() const;

private:
    class File;

    void list() const;
    void listFolder(const std::string& folder, std::vector<std::string>& found) const;

    const std::vector<std::string> paths_;
    mutable std::mutex mutex_;
    mutable std::unique_ptr<FolderChanges> changes_;  // none for a single file, which is simply looked at
    mutable std::vector<std::unique_ptr<File>> files_;
    mutable std::vector<std::shared_ptr<const ProfileDocument>> documents_;  // that the content was made of
    mutable std::shared_ptr<const ProfileContent> content_;
};

}  // namespace vrx::host
