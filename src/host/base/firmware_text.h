// What the firmware tells of the machine, and what of that counts.
#pragma once

#include <optional>
#include <string>
#include <string_view>

namespace vrx::host {

// The text without blanks around it, up to its first NUL. Nothing where it holds control characters, or is one of the
// placeholders that stand in firmware whose maker filled in nothing.
std::optional<std::string> meaningfulFirmwareText(std::string_view text);

}  // namespace vrx::host
