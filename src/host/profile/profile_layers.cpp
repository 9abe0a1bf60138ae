#include "vrx/host/profile/profile_layers.h"

#include <algorithm>
#include <cerrno>
#include <filesystem>
#include <utility>

#include "vrx/host/base/current_copy.h"
#include "vrx/host/base/request_scope.h"
#include "vrx/host/profile/profile_reader.h"
#include "vrx/platform/log.h"

namespace vrx::host {

using platform::Level;
using platform::Result;

namespace {

constexpr std::size_t mostDropIns = 100;  // in one folder

std::shared_ptr<const ProfileDocument> substitute() {
    auto document = std::make_shared<ProfileDocument>();
    document->isSubstitute = true;
    return document;
}

}  // namespace

// One file in its last good state. Each thing is reported once, although a file that has just changed is read several
// times.
class ProfileLayers::File {
public:
    explicit File(const std::string& path)
        : copy_(path, [this](const Result<FileContent>& file, std::shared_ptr<const ProfileDocument> last) {
              return read(file, std::move(last));
          }) {}

    const std::string& path() const { return copy_.path(); }
    std::shared_ptr<const ProfileDocument> document() const { return copy_.get(); }
    const std::vector<Problem>& problems() const { return problems_; }

private:
    using Kind = Problem::Kind;

    // Without a file the document is empty.
    std::shared_ptr<const ProfileDocument> read(const Result<FileContent>& file,
                                                std::shared_ptr<const ProfileDocument> last) {
        if (!last) last = substitute();
        if (!file && file.error().code == ENOENT) {
            report({});
            return std::make_shared<const ProfileDocument>();
        }
        Result<ProfileReading> reading = file ? parseProfile(file->text(), path()) : file.error();
        if (!reading) {
            report({{Kind::Mistake, reading.error().text + "; this file is not taken over"}});
            return last;
        }
        const std::shared_ptr<ProfileDocument> document = reading->document;
        document->file.wasOpenToOthers = findOpenToOthers(path(), file->status).has_value();
        std::vector<Problem> problems;
        for (const std::string& warning : reading->warnings) problems.push_back({Kind::Warning, warning});
        if (const auto open = reading->needsTrust ? document->file.findOpenToOthers() : std::nullopt)
            problems.push_back(
                {Kind::OpenToOthers, open->path +
                                         ": others can write it; the bundles, defaults, http.ca_file and "
                                         "account.credential_helper of " +
                                         path() + " are not believed"});
        report(std::move(problems));
        return document;
    }

    void report(std::vector<Problem> problems) {
        problems_ = std::move(problems);
        std::string text;
        for (const Problem& problem : problems_) text += (text.empty() ? "" : "; ") + problem.text;
        if (std::exchange(reported_, text) == text || text.empty()) return;
        log(problems_.front().kind == Kind::Mistake ? Level::Error : Level::Default, "%@", text);
    }

    std::vector<Problem> problems_;
    std::string reported_;
    const CurrentCopy<ProfileDocument> copy_;
};

ProfileLayers::ProfileLayers(std::vector<std::string> paths) : paths_(std::move(paths)) {}

ProfileLayers::~ProfileLayers() = default;

std::shared_ptr<const ProfileContent> ProfileLayers::content() const {
    std::lock_guard lock(mutex_);
    if (content_ && !RequestScope::isFirstLook(this)) return content_;
    const bool isFirst = !content_;
    const bool isSingleFile = paths_.size() == 1 && !paths_.front().ends_with('/');
    if (isFirst && !paths_.empty() && !isSingleFile) changes_ = std::make_unique<FolderChanges>(paths_);
    bool isChanged = isFirst;
    // Asked before the folders are read, so that a change in between shows at the next call.
    if ((changes_ && changes_->take()) || isFirst) {
        list();
        isChanged = true;
    }
    for (std::size_t i = 0; i < files_.size(); ++i) {
        std::shared_ptr<const ProfileDocument> document = files_[i]->document();
        isChanged = isChanged || document != documents_[i];
        documents_[i] = std::move(document);
    }
    if (isChanged) content_ = std::make_shared<const ProfileContent>(mergedContent(documents_));
    return content_;
}

std::vector<ProfileLayers::Problem> ProfileLayers::problems() const {
    content();
    std::lock_guard lock(mutex_);
    std::vector<Problem> problems;
    for (const auto& file : files_) problems.insert(problems.end(), file->problems().begin(), file->problems().end());
    return problems;
}

std::vector<ProfileKey> ProfileLayers::keys() const {
    content();
    std::lock_guard lock(mutex_);
    return mergedKeys(documents_);
}

std::vector<std::string> ProfileLayers::files() const {
    content();
    std::lock_guard lock(mutex_);
    std::vector<std::string> files;
    for (const auto& document : documents_)
        if (!document->file.path.empty()) files.push_back(document->file.path);
    return files;
}

// Finds the files that there are now. Those that are known already keep their state.
void ProfileLayers::list() const {
    std::vector<std::string> found;
    for (const std::string& path : paths_) {
        std::error_code none;
        if (path.ends_with('/'))
            listFolder(path, found);
        else if (!changes_ || std::filesystem::exists(std::filesystem::symlink_status(path, none)))
            found.push_back(path);
    }
    std::vector<std::unique_ptr<File>> files;
    for (const std::string& path : found) {
        const auto known = std::ranges::find_if(files_, [&](const auto& file) { return file && file->path() == path; });
        files.push_back(known == files_.end() ? std::make_unique<File>(path) : std::move(*known));
    }
    files_ = std::move(files);
    documents_.assign(files_.size(), nullptr);
}

void ProfileLayers::listFolder(const std::string& folder, std::vector<std::string>& found) const {
    std::vector<std::string> names;
    std::error_code error;
    for (std::filesystem::directory_iterator entry(folder, error), end; !error && entry != end; entry.increment(error))
        if (const std::string name = entry->path().filename(); name.ends_with(".toml") && !name.starts_with('.'))
            names.push_back(name);
    if (error && error.value() != ENOENT && error.value() != ENOTDIR)
        log(Level::Error, "cannot read the folder %@: %@", folder, error.message());
    std::ranges::sort(names);
    if (names.size() > mostDropIns) {
        log(Level::Error, "%@: of more than %lu files only the first are read", folder, mostDropIns);
        names.resize(mostDropIns);
    }
    for (const std::string& name : names) found.push_back(folder + name);
}

}  // namespace vrx::host
