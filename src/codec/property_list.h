// Property-list documents as values, in both forms: XML, and the binary one, "bplist00". Any thread may call.
#pragma once

#include "vrx/platform/error.h"
#include "vrx/platform/property_list.h"
#include "vrx/platform/value.h"

namespace vrx::codec {

// Reads either form. Unsigned integers beyond int64 become doubles, and of entries with the same key the last counts.
// The error's text tells line and column in XML, the byte in the binary form. Memory stays within a small multiple of
// the document, whatever the document declares: contents that objects share or overlap count at every use.
platform::Result<platform::Value> parsePropertyList(const platform::Data& document);

// Fails for what a property list cannot hold: a null anywhere, text that is not UTF-8, a date that is not finite, and a
// value that is nested too deeply to be read again. XML cannot hold control characters or the years outside 1 to 9999,
// and drops a date's fraction of a second.
platform::Result<platform::Data> serializePropertyList(const platform::Value& root,
                                                       platform::PropertyListFormat format);

}  // namespace vrx::codec
