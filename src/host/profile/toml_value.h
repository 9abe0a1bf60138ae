// What a TOML file says, as a property value: booleans, numbers, texts, lists and tables as such, dates and times as
// their text. Any thread may call.
#pragma once

#include <toml++/toml.h>

#include "vrx/platform/value.h"

namespace vrx::host {

platform::Value valueOf(const toml::node& node);

}  // namespace vrx::host
