// Bytes as base64 text, with padding. Any thread may call.
#pragma once

#include <optional>
#include <string>
#include <string_view>

#include "vrx/platform/value.h"

namespace vrx::codec {

std::string base64FromData(const platform::Data& data);
// Ignores white space between the characters. Null for any other character, and when characters are missing.
std::optional<platform::Data> dataFromBase64(std::string_view text);

}  // namespace vrx::codec
