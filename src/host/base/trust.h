// Whether a file may be believed, or run: only while root and the agent's own user alone can change it. They must own
// the file and every folder above it, and nobody else may write to any of them. One exception: others may write to a
// folder with the sticky bit, such as /tmp, because they cannot replace what is not theirs there. Any thread may ask.
#pragma once

#include <sys/stat.h>

#include <optional>
#include <string>

#include "vrx/platform/error.h"

namespace vrx::host {

// Why a file is not believed.
struct OpenToOthers {
    std::string path;       // the file or folder that others can change
    platform::Error error;  // for people; says the same
};

// A link that is followed must be kept from others itself, as must everything on the way to its target.
enum class Links { Refused, Followed };

// Nothing when the file and every folder above it are kept from others. A relative path starts at the working
// directory.
std::optional<OpenToOthers> findOpenToOthers(const std::string& path, Links links);

// The same for a single file or folder, by its status.
std::optional<OpenToOthers> findOpenToOthers(const std::string& path, const struct stat& status);

// Judges from now on as that user's agent would; without a call, as this process's user. Before other threads.
void judgeAsAgentOf(uid_t user);

}  // namespace vrx::host
