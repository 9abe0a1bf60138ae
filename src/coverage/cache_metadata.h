// What the defaults keep beside a cached record: when it was stored, for which locale and in which format. One value
// each for a serial number, under its hash.
#pragma once

#include <string>
#include <string_view>

#include "platform/sha256_hash.h"

namespace vrx {

inline constexpr std::string_view cachedWarrantyLastUpdatedDateKey = "CachedWarrantyLastUpdatedDate";
inline constexpr std::string_view cachedWarrantyLocaleKey = "CachedWarrantyLocale";
inline constexpr std::string_view cachedWarrantyVersionKey = "CachedWarrantyVersion";

// The format that is written, and the only one that is read.
inline constexpr std::string_view currentCacheVersion = "2";

inline std::string cacheMetadataKey(std::string_view serialNumber, std::string_view key) {
    return platform::sha256Hash(serialNumber).append("_").append(key);
}

}  // namespace vrx
