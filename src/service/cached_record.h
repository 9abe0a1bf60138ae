// Whether a cached coverage record may answer a request: for the lookup policy and for whoever explains it. Any thread.
#pragma once

#include <cstdint>
#include <optional>
#include <string>

namespace vrx {

class VRXAgentWarrantyProvider;

// Why it may not: it does not match the running system, or the user is not there to see it.
enum class CachedRecordFlaw : std::uint8_t { OutdatedVersion, OtherLocale, SignedOut };

// The first that holds for the device's record, which must be there; nothing when it may answer. Logs its verdict. It
// is the lookup policy's own judgement, and stands with it.
std::optional<CachedRecordFlaw> flawOfCachedRecord(VRXAgentWarrantyProvider& provider,
                                                   const std::optional<std::string>& serialNumber);

}  // namespace vrx
