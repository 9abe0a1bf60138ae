// The devices whose follow-ups were posted, and those whose follow-ups were dismissed: two lists in the settings that
// hold the hashes of serial numbers. Each change is one atomic step, so that threads and processes that change a list
// at once lose nothing. A stored value that is not a list reads as an empty list, and the next entry replaces it. An
// element that is not a string stays where it is and stands for no device.
#pragma once

#include <set>
#include <string>
#include <string_view>

namespace vrx {

// "Followup" is spelled so on purpose.
inline constexpr std::string_view postedSerialNumberHashesKey = "FollowupPostedSerialNumberHashes";
inline constexpr std::string_view dismissedSerialNumberHashesKey = "FollowupDismissedSerialNumberHashes";

std::set<std::string> serialNumberHashes(std::string_view key);
// Appends the hash to the list, even when the list holds it already.
void appendSerialNumberHash(std::string_view key, const std::string& serialNumber);
// Appends the hash to the list; writes nothing when the list holds it already.
void appendMissingSerialNumberHash(std::string_view key, const std::string& serialNumber);

}  // namespace vrx
