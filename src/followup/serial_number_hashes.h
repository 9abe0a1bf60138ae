// The devices whose follow-ups were posted and those whose follow-ups were dismissed: two lists in the settings that
// hold the hashes of serial numbers. Each change is one atomic step, so that threads and processes that change a list
// at once lose nothing. A stored value that is no list reads as an empty one, and the next entry takes its place; an
// element that is no string stays where it is and stands for no device.
#pragma once

#include <set>
#include <string>
#include <string_view>

namespace vrx {

inline constexpr std::string_view postedSerialNumberHashesKey = "FollowupPostedSerialNumberHashes";
inline constexpr std::string_view dismissedSerialNumberHashesKey = "FollowupDismissedSerialNumberHashes";

std::set<std::string> serialNumberHashes(std::string_view key);
// At the end of the list, also when the hash is there already.
void appendSerialNumberHash(std::string_view key, const std::string& serialNumber);
// At the end of the list, and nothing is written when the hash is there already.
void appendMissingSerialNumberHash(std::string_view key, const std::string& serialNumber);

}  // namespace vrx
