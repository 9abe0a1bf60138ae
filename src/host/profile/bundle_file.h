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

// The file of a folder, believed only as isKeptFromOthers() says. An error's text is for people; its code is ENOENT
// when there is no file.
platform::Result<BundleFile> readBundleFile(const std::string& folder);

// Nothing when only root and the agent's own user can change what stands at the absolute path: they own the file and
// every folder above it, and nobody else may write to any of them. Others may write to a folder with the sticky bit,
// such as /tmp: it keeps them from replacing what is not theirs. An error tells what is open to others.
platform::MaybeError isKeptFromOthers(const std::string& path);

}  // namespace vrx::host
