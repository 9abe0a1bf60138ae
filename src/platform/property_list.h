// Property-list documents. Any thread may use it.
#pragma once

#include <string_view>

#include "vrx/platform/error.h"
#include "vrx/platform/value.h"

namespace vrx::platform {

enum class PropertyListFormat { Xml, Binary };

class PropertyList {
public:
    virtual ~PropertyList() = default;
    // Reads either form. The error's text says where in the document the mistake is.
    virtual Result<Value> parse(const Data& document) const = 0;
    // Fails for a value that a property list cannot hold, such as a null at any depth.
    virtual Result<Data> serialize(const Value& root, PropertyListFormat format) const = 0;
};

}  // namespace vrx::platform
