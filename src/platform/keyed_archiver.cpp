#include "vrx/platform/keyed_archiver.h"

#include <algorithm>

namespace vrx::platform {

bool AllowedKinds::admit(const Value& value) const {
    auto allowed = [this](Kind kind) { return (kinds_ & kind) != 0; };
    switch (value.type()) {
        case Value::Type::String: return allowed(Strings);
        case Value::Type::Bool:
        case Value::Type::Integer:
        case Value::Type::Double: return allowed(Numbers);
        case Value::Type::Date: return allowed(Dates);
        case Value::Type::Array:
            return allowed(Arrays) &&
                   std::ranges::all_of(*value.asArray(), [this](const Value& v) { return admit(v); });
        case Value::Type::Dictionary:
            return allowed(Dictionaries) && std::ranges::all_of(*value.asDictionary(), [this](const auto& entry) {
                       return admit(entry.second);
                   });
        case Value::Type::Null:
        case Value::Type::Data: return false;
    }
    return false;
}

}  // namespace vrx::platform
