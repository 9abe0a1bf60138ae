#include "vrx/host/profile/toml_value.h"

#include <sstream>

namespace vrx::host {

using platform::Array;
using platform::Dictionary;
using platform::Value;

Value valueOf(const toml::node& node) {
    if (const auto* flag = node.as_boolean()) return flag->get();
    if (const auto* integer = node.as_integer()) return integer->get();
    if (const auto* number = node.as_floating_point()) return number->get();
    if (const auto* text = node.as_string()) return text->get();
    if (const auto* array = node.as_array()) {
        Array elements;
        for (const toml::node& element : *array) elements.push_back(valueOf(element));
        return elements;
    }
    if (const auto* table = node.as_table()) {
        Dictionary entries;
        for (const auto& [key, entry] : *table) entries[std::string(key.str())] = valueOf(entry);
        return entries;
    }
    std::ostringstream text;
    node.visit([&](const auto& value) { text << value; });
    return text.str();
}

}  // namespace vrx::host
