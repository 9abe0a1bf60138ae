// The binary form of property lists; property_list.h says what both forms have in common. Any thread may call.
//
// A document is a header, objects, a table of the objects' offsets, and a trailer. The trailer says where the table is,
// how wide its entries and the references to objects are, and which object is the root. Objects refer to each other by
// number.
#pragma once

#include "vrx/platform/error.h"
#include "vrx/platform/value.h"

namespace vrx::codec {

bool isBinaryPropertyList(const platform::Data& document);
platform::Result<platform::Value> parseBinaryPropertyList(const platform::Data& document);
platform::Result<platform::Data> serializeBinaryPropertyList(const platform::Value& root);

}  // namespace vrx::codec
