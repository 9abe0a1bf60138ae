// What the defaults hold about a cached record: when it was stored, for which locale and in which format. Each serial
// number has one value of each kind, under its hash.
#pragma once

#include <string>
#include <string_view>

#include "vrx/platform/sha256_hash.h"
#include "vrx/platform/text.h"

namespace vrx {

// Keys; the "%@" stands for the hash.
inline constexpr std::string_view cachedWarrantyLastUpdatedDateKey = "%@_CachedWarrantyLastUpdatedDate";
inline constexpr std::string_view cachedWarrantyLocaleKey = "%@_CachedWarrantyLocale";
inline constexpr std::string_view cachedWarrantyVersionKey = "%@_CachedWarrantyVersion";

// The format that is written, and the only one that is read.
inline constexpr std::string_view currentCacheVersion = "2";

inline std::string cacheMetadataKey(std::string_view serialNumber, std::string_view key) {
    return platform::filled(key, {platform::sha256Hash(serialNumber)});
}

// The same key in the older single-device layout, which named no device.
constexpr std::string_view legacyCacheMetadataKey(std::string_view key) {
    return key.substr(std::string_view("%@_").size());
}

}  // namespace vrx
