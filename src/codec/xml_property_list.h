// The XML form of property lists; property_list.h says what both forms have in common. Any thread may call.
#pragma once

#include "vrx/platform/error.h"
#include "vrx/platform/value.h"

namespace vrx::codec {

platform::Result<platform::Value> parseXmlPropertyList(const platform::Data& document);
platform::Result<platform::Data> serializeXmlPropertyList(const platform::Value& root);

}  // namespace vrx::codec
