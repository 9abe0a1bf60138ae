#include "codec/digest.h"

#include <gcrypt.h>

namespace vrx::codec {

namespace {

// Once in a process; another library of the process may have done it before us.
bool initializeLibrary() {
    if (gcry_control(GCRYCTL_INITIALIZATION_FINISHED_P)) return true;
    gcry_check_version(nullptr);
    gcry_control(GCRYCTL_DISABLE_SECMEM);  // digests keep no secrets; spares the locked pages
    gcry_control(GCRYCTL_INITIALIZATION_FINISHED);
    return true;
}

}  // namespace

std::array<std::uint8_t, 32> sha256(std::string_view bytes) {
    static const bool initialized = initializeLibrary();
    static_cast<void>(initialized);
    std::array<std::uint8_t, 32> digest;
    gcry_md_hash_buffer(GCRY_MD_SHA256, digest.data(), bytes.data(), bytes.size());
    return digest;
}

}  // namespace vrx::codec
