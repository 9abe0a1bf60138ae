// Key files: lines of key=value below lines of [group], and comments, as desktop files are. Any thread may call.
#pragma once

#include <functional>
#include <string_view>

namespace vrx::codec {

// Calls with the entries of a group in their order: the key with what brackets behind it say, "Name[de]", and the value
// as it is written, both without blanks around them. False, perhaps after some calls, when a line is none of those.
bool readKeyFile(std::string_view document, std::string_view group,
                 const std::function<void(std::string_view key, std::string_view value)>& entry);

}  // namespace vrx::codec
