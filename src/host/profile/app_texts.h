// What an application's AppStream metainfo and desktop file say of it for people: its name and its vendor. Any thread
// may call.
#pragma once

#include <optional>
#include <string>
#include <vector>

namespace vrx::host {

struct AppTexts {
    std::optional<std::string> name;
    std::optional<std::string> vendor;
};

// Where such files are, by the process's environment, the most important folder first: the user's own, those into which
// Flatpak exports, $XDG_DATA_DIRS and the system's.
std::vector<std::string> sharedFolders();

// The texts in the language, or the nearest to it; each from the first of the folders that has it, there from the
// metainfo before the desktop file. A file that others can change, that is malformed or over 2 MiB counts as absent;
// the log says why.
AppTexts readAppTexts(const std::string& identifier, const std::string& language,
                      const std::vector<std::string>& folders);

}  // namespace vrx::host
