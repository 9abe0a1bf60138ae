// Reads the files of the device profile, one by one and then as one. Any thread may call.
#pragma once

#include <memory>
#include <string>
#include <string_view>
#include <vector>

#include "vrx/host/profile/profile_content.h"
#include "vrx/host/profile/toml_value.h"
#include "vrx/platform/error.h"

namespace vrx::host {

// One file, without a mistake. Not to be copied: the copy of a table forgets its lines.
struct ProfileDocument {
    ProfileFile file = {};
    toml::table root = {};
    bool isSubstitute = false;  // stands in for a file that could not be read yet
};

struct ProfileReading {
    std::shared_ptr<ProfileDocument> document;
    std::vector<std::string> warnings = {};  // of what the agent does not know or cannot use: "PATH:LINE: …"
    bool needsTrust = false;                 // it holds what is believed only of a trusted file
};

// Reads a file's text. The text of an error begins "PATH:LINE: ".
platform::Result<ProfileReading> parseProfile(std::string_view text, const std::string& path);

// What the documents say together, the later ones winning key by key: tables merge, bundles add up, any other array is
// taken whole.
ProfileContent mergedContent(const std::vector<std::shared_ptr<const ProfileDocument>>& documents);

// Every key, whether a file gives it or not, in the order of their tables. Of what stands in lists, and of names that
// files make up, those that are there.
std::vector<ProfileKey> mergedKeys(const std::vector<std::shared_ptr<const ProfileDocument>>& documents);

}  // namespace vrx::host
