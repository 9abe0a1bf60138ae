// JSON documents. Any thread may use it.
#pragma once

#include <string>
#include <string_view>

#include "vrx/platform/error.h"
#include "vrx/platform/value.h"

namespace vrx::platform {

class Json {
public:
    virtual ~Json() = default;
    // Integers beyond int64 become doubles; of members with the same name the last counts. The error's text says where
    // in the document the mistake is.
    virtual Result<Value> parse(std::string_view document) const = 0;
    // Compact, UTF-8. Fails for dates, data and numbers that are not finite.
    virtual Result<std::string> serialize(const Value& root) const = 0;
};

}  // namespace vrx::platform
