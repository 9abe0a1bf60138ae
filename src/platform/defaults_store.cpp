#include "vrx/platform/defaults_store.h"

#include "vrx/platform/number_text.h"

namespace vrx::platform {

std::int64_t DefaultsStore::integer(std::string_view key) const {
    return integerFromValue(get(key));
}

double DefaultsStore::number(std::string_view key) const {
    return numberFromValue(get(key));
}

bool DefaultsStore::boolean(std::string_view key) const {
    return flagFromValue(get(key));
}

std::optional<std::string> DefaultsStore::string(std::string_view key) const {
    Value value = get(key);
    const std::string* text = value.asString();
    return text ? std::optional(*text) : std::nullopt;
}

std::optional<Date> DefaultsStore::date(std::string_view key) const {
    return get(key).asDate();
}

Value DefaultsStore::dictionary(std::string_view key) const {
    Value value = get(key);
    return value.asDictionary() ? value : Value();
}

}  // namespace vrx::platform
