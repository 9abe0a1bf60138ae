// The errors of both forms of property lists.
#pragma once

#include <cerrno>
#include <string>

#include "vrx/platform/error.h"

namespace vrx::codec {

inline platform::Error invalidPropertyList(const std::string& place, const std::string& reason) {
    return {platform::error_domain::propertyList, EBADMSG, "invalid property list at " + place + ": " + reason};
}

inline platform::Error unwritablePropertyList(const std::string& what) {
    return {platform::error_domain::propertyList, EINVAL, "a property list cannot hold " + what};
}

}  // namespace vrx::codec
