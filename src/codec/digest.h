// Message digests. Any thread may call.
#pragma once

#include <array>
#include <cstdint>
#include <string_view>

namespace vrx::codec {

std::array<std::uint8_t, 32> sha256(std::string_view bytes);

}  // namespace vrx::codec
