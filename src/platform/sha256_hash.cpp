#include "vrx/platform/sha256_hash.h"

#include "vrx/platform/digest.h"
#include "vrx/platform/platform.h"

namespace vrx::platform {

std::string sha256Hash(std::string_view text) {
    constexpr char digits[] = "0123456789abcdef";
    std::string hash;
    hash.reserve(64);
    for (std::uint8_t byte : Platform::current().digest().sha256(text.substr(0, text.find('\0')))) {
        hash += digits[byte >> 4];
        hash += digits[byte & 15];
    }
    return hash;
}

}  // namespace vrx::platform
