// Random identifiers. Any thread may ask.
#pragma once

#include <string>

namespace vrx::platform {

class UuidSource {
public:
    virtual ~UuidSource() = default;
    // A new one at each call, in the canonical form of 36 characters.
    virtual std::string makeUuid() = 0;
};

}  // namespace vrx::platform
