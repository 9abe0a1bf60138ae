#include "vrx/platform/value.h"

#include <algorithm>
#include <cmath>
#include <limits>

#include "vrx/platform/text.h"

namespace vrx::platform {

namespace {

constexpr double twoTo63 = 9223372036854775808.0;

bool equalNumbers(std::int64_t integer, double real) {
    return real >= -twoTo63 && real < twoTo63 && std::trunc(real) == real && static_cast<std::int64_t>(real) == integer;
}

}  // namespace

Value::Value(std::uint64_t value) {
    if (value <= static_cast<std::uint64_t>(std::numeric_limits<std::int64_t>::max()))
        content_ = static_cast<std::int64_t>(value);
    else
        content_ = static_cast<double>(value);
}

Value::Value(std::string value) : content_(std::make_shared<const std::string>(std::move(value))) {}
Value::Value(platform::Data value) : content_(std::make_shared<const platform::Data>(std::move(value))) {}
Value::Value(platform::Array value) : content_(std::make_shared<const platform::Array>(std::move(value))) {}
Value::Value(platform::Dictionary value) : content_(std::make_shared<const platform::Dictionary>(std::move(value))) {}

std::optional<bool> Value::asBool() const {
    const bool* value = std::get_if<bool>(&content_);
    return value ? std::optional(*value) : std::nullopt;
}

std::optional<std::int64_t> Value::asInteger() const {
    const auto* value = std::get_if<std::int64_t>(&content_);
    return value ? std::optional(*value) : std::nullopt;
}

std::optional<double> Value::asNumber() const {
    if (const auto* integer = std::get_if<std::int64_t>(&content_)) return static_cast<double>(*integer);
    if (const auto* real = std::get_if<double>(&content_)) return *real;
    return std::nullopt;
}

std::optional<platform::Date> Value::asDate() const {
    const auto* value = std::get_if<platform::Date>(&content_);
    return value ? std::optional(*value) : std::nullopt;
}

template <class T>
const T* Value::shared() const {
    const auto* pointer = std::get_if<Shared<T>>(&content_);
    return pointer ? pointer->get() : nullptr;
}

const std::string* Value::asString() const {
    return shared<std::string>();
}
const platform::Data* Value::asData() const {
    return shared<platform::Data>();
}
const platform::Array* Value::asArray() const {
    return shared<platform::Array>();
}
const platform::Dictionary* Value::asDictionary() const {
    return shared<platform::Dictionary>();
}

const Value& Value::operator[](std::string_view key) const {
    static const Value nothing;
    const platform::Dictionary* dictionary = asDictionary();
    if (!dictionary) return nothing;
    auto entry = dictionary->find(key);
    return entry == dictionary->end() ? nothing : entry->second;
}

bool Value::operator==(const Value& other) const {
    if (type() != other.type()) {
        if (type() == Type::Integer && other.type() == Type::Double)
            return equalNumbers(std::get<std::int64_t>(content_), std::get<double>(other.content_));
        if (type() == Type::Double && other.type() == Type::Integer)
            return equalNumbers(std::get<std::int64_t>(other.content_), std::get<double>(content_));
        return false;
    }
    switch (type()) {
        case Type::String: return *asString() == *other.asString();
        case Type::Data: return *asData() == *other.asData();
        case Type::Array: return asArray() == other.asArray() || *asArray() == *other.asArray();
        case Type::Dictionary:
            return asDictionary() == other.asDictionary() || *asDictionary() == *other.asDictionary();
        default: return content_ == other.content_;
    }
}

std::string Value::description() const {
    switch (type()) {
        case Type::Null: return describeNothing();
        case Type::Bool: return std::get<bool>(content_) ? "1" : "0";
        case Type::Integer: return describe(std::get<std::int64_t>(content_));
        case Type::Double: return describe(std::get<double>(content_));
        case Type::Date: return describe(std::get<platform::Date>(content_));
        case Type::String: return describe(*asString());
        case Type::Data: return "<" + std::to_string(asData()->size()) + " bytes>";
        case Type::Array: return describe(*asArray());
        case Type::Dictionary: return describe(*asDictionary());
    }
    return {};
}

int nestingDepth(const Value& value, int limit) {
    int deepest = 0;
    auto consider = [&](const Value& child) {
        if (deepest < limit) deepest = std::max(deepest, nestingDepth(child, limit - 1));
    };
    if (const Array* array = value.asArray()) {
        for (const Value& element : *array) consider(element);
    } else if (const Dictionary* dictionary = value.asDictionary()) {
        for (const auto& [key, element] : *dictionary) consider(element);
    } else {
        return 0;
    }
    return deepest + 1;
}

}  // namespace vrx::platform
