#include "vrx/host/profile/app_texts.h"

#include <algorithm>
#include <cerrno>
#include <cstdlib>
#include <utility>

#include "vrx/codec/key_file.h"
#include "vrx/codec/metainfo.h"
#include "vrx/codec/translated_text.h"
#include "vrx/host/base/files.h"
#include "vrx/host/base/text.h"
#include "vrx/host/base/trust.h"
#include "vrx/platform/log.h"

namespace vrx::host {

using platform::Error;
using platform::MaybeError;
using platform::Result;

namespace {

constexpr std::size_t mostAppTextBytes = 2 * 1024 * 1024;

// Links are followed, because what Flatpak exports is made of them.
Result<FileContent> readTrustedFile(const std::string& path) {
    Result<FileContent> content = readFile(path, mostAppTextBytes);
    if (!content) return content.error();
    if (auto open = findOpenToOthers(path, content->status)) return open->error;
    if (auto open = findOpenToOthers(path, Links::Followed)) return open->error;
    return content;
}

// A line end within the text becomes a blank, as every white space does.
std::optional<std::string> unescaped(std::string_view value) {
    std::string text;
    for (std::size_t i = 0; i < value.size(); ++i) {
        if (value[i] != '\\') {
            text += value[i];
            continue;
        }
        if (++i == value.size() || std::string_view("sntr\\").find(value[i]) == std::string_view::npos)
            return std::nullopt;
        text += value[i] == '\\' ? '\\' : ' ';
    }
    return text;
}

// The language of "Name[LANGUAGE]", empty of "Name"; null for another key.
std::optional<std::string_view> languageOfName(std::string_view key) {
    constexpr std::string_view name = "Name";
    if (!key.starts_with(name)) return std::nullopt;
    key.remove_prefix(name.size());
    if (key.empty()) return key;
    if (key.size() < 3 || !key.starts_with('[') || !key.ends_with(']')) return std::nullopt;
    return key.substr(1, key.size() - 2);
}

// Completes the texts by one file.
using AppFileReader = MaybeError (*)(const FileContent& file, const std::string& language, AppTexts& texts);

MaybeError readMetainfo(const FileContent& file, const std::string& language, AppTexts& texts) {
    Result<codec::Metainfo> metainfo = codec::parseMetainfo(file.bytes, language);
    if (!metainfo) return metainfo.error();
    if (!texts.name) texts.name = metainfo->name;
    if (!texts.vendor) texts.vendor = metainfo->developer;
    return std::nullopt;
}

MaybeError readDesktopFile(const FileContent& file, const std::string& language, AppTexts& texts) {
    if (texts.name) return std::nullopt;  // it does not tell the vendor
    codec::TranslatedText name(language);
    const auto offer = [&](std::string_view key, std::string_view value) {
        const auto of = languageOfName(key);
        const auto text = of ? unescaped(value) : std::nullopt;
        if (text) name.offer(*of, *text);
    };
    if (!codec::readKeyFile(file.text(), "Desktop Entry", offer))
        return Error{platform::error_domain::bundle, EBADMSG, "invalid desktop file"};
    texts.name = name.nearest();
    return std::nullopt;
}

}  // namespace

std::vector<std::string> sharedFolders() {
    std::vector<std::string> folders;
    const auto add = [&](std::string folder) {
        while (folder.ends_with('/')) folder.pop_back();
        // Paths that are not absolute do not count.
        if (folder.starts_with('/') && std::ranges::find(folders, folder) == folders.end()) folders.push_back(folder);
    };
    const auto variable = [](const char* name) {
        const char* value = std::getenv(name);
        return std::string(value ? value : "");
    };
    std::string own = variable("XDG_DATA_HOME");
    if (!own.starts_with('/')) own = variable("HOME") + "/.local/share";
    add(own);
    add(own + "/flatpak/exports/share");
    add("/var/lib/flatpak/exports/share");
    const std::string more = variable("XDG_DATA_DIRS");
    for (std::size_t begin = 0; begin < more.size();) {
        const std::size_t end = std::min(more.find(':', begin), more.size());
        add(more.substr(begin, end - begin));
        begin = end + 1;
    }
    add("/usr/local/share");
    add("/usr/share");
    return folders;
}

AppTexts readAppTexts(const std::string& identifier, const std::string& language,
                      const std::vector<std::string>& folders) {
    AppTexts texts;
    if (!isApplicationIdentifier(identifier)) return texts;
    const std::pair<std::string, AppFileReader> files[] = {
        {"/metainfo/" + identifier + ".metainfo.xml", readMetainfo},
        {"/metainfo/" + identifier + ".appdata.xml", readMetainfo},
        {"/appdata/" + identifier + ".appdata.xml", readMetainfo},  // where older releases have it
        {"/applications/" + identifier + ".desktop", readDesktopFile},
    };
    for (const std::string& folder : folders)
        for (const auto& [file, read] : files) {
            if (texts.name && texts.vendor) return texts;
            const std::string path = folder + file;
            const Result<FileContent> content = readTrustedFile(path);
            if (!content && (content.error().code == ENOENT || content.error().code == ENOTDIR)) continue;
            if (const MaybeError error = content ? read(*content, language, texts) : content.error())
                log(platform::Level::Default, "Not taken for what it says of an application, %@: %@", path,
                    error->text);
        }
    return texts;
}

}  // namespace vrx::host
