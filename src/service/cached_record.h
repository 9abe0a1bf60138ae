// Whether a cached coverage record may answer a request: for the lookup policy and for the program that explains it.
// Any thread may ask.
#pragma once

#include <cstdint>
#include <optional>
#include <string>

namespace vrx {

class VRXAgentWarrantyProvider;

// Why it may not: it does not match the running system, or the user is signed out.
enum class CachedRecordFlaw : std::uint8_t { OutdatedVersion, OtherLocale, SignedOut };

// The first flaw of the device's cached record, which must exist; null when the record may answer. Logs the verdict.
// This is the lookup policy's own judgement and is defined with it.
std::optional<CachedRecordFlaw> flawOfCachedRecord(VRXAgentWarrantyProvider& provider,
                                                   const std::optional<std::string>& serialNumber);

}  // namespace vrx
