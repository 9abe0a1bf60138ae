// A chronicle as the JSON document that programs print and the page holds.
#pragma once

#include "timeline/chronicle.h"
#include "vrx/platform/value.h"

namespace vrx::timeline {

platform::Dictionary documentOf(const Chronicle& chronicle);
platform::Value documentOf(const Shown& shown);

}  // namespace vrx::timeline
