// Message digests. Any thread may use it.
#pragma once

#include <array>
#include <cstdint>
#include <string_view>

namespace vrx::platform {

class Digest {
public:
    virtual ~Digest() = default;
    virtual std::array<std::uint8_t, 32> sha256(std::string_view bytes) const = 0;
};

}  // namespace vrx::platform
