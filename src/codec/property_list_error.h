// The errors of both forms of property lists.
#pragma once

#include <cerrno>
#include <string>

#include "vrx/platform/error.h"

namespace vrx::codec {

inline platform::Error invalidPropertyList(const std::string& place, const std::string& reason) {
    return {"property list", EBADMSG, "invalid property list at " + place + ": " + reason};
}

inline platform::Error unwritablePropertyList(const std::string& what) {
    return {"property list", EINVAL, "a property list cannot hold " + what};
}

}  // namespace vrx::codec
