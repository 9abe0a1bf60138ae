// bundle.toml, which makes the folder that holds it an application bundle:
//
//     identifier = "com.example.viewer"
//     name = "Viewer"
//     vendor = "Example Ltd."
//     group = "viewer"                           # only callers whose group this is hold the entitlements
//     [entitlements]
//     "com.orvane.private.vrxagent" = true       # a value of any type
//
// All keys can be left out. Any thread may read it.
#pragma once

#include <optional>
#include <string>
#include <string_view>

#include "vrx/platform/error.h"
#include "vrx/platform/value.h"

namespace vrx::host {

struct BundleFile {
    std::string folder;
    std::optional<std::string> identifier;
    std::optional<std::string> name;
    std::optional<std::string> vendor;
    std::optional<std::string> group;
    platform::Dictionary entitlements;
};

inline constexpr const char* bundleFileName = "bundle.toml";

// The file of a folder, believed only while others can change neither it nor a folder above it (trust.h). An error's
// text is for people; its code is ENOENT when there is no file.
platform::Result<BundleFile> readBundleFile(const std::string& folder);
// What a document says that would lie in the folder, whether believed or not.
platform::Result<BundleFile> parseBundleFile(std::string_view document, const std::string& folder);

}  // namespace vrx::host
