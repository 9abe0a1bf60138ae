// A property value: what JSON, property lists, the defaults, the keyed archive and the IPC encoding all speak.
// Immutable and cheaply shared: a copy of a string, data, array or dictionary shares its content. Any thread may read
// it. A null value stands both for a JSON null and for an absent value. Reading a value as a type that it does not have
// returns null.
#pragma once

#include <concepts>
#include <cstdint>
#include <map>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <variant>
#include <vector>

#include "vrx/platform/api.h"
#include "vrx/platform/date.h"

namespace vrx::platform {

class Value;

using Data = std::vector<std::uint8_t>;
using Array = std::vector<Value>;
using Dictionary = std::map<std::string, Value, std::less<>>;

class VRX_CLIENT_API Value {
public:
    enum class Type : std::uint8_t { Null, Bool, Integer, Double, Date, String, Data, Array, Dictionary };

    Value() = default;
    Value(std::nullptr_t) {}
    // Constrained, so that a pointer does not turn into a bool.
    template <std::same_as<bool> B>
    Value(B value) : content_(value) {}
    template <std::integral I>
    requires(!std::same_as<I, bool> && (std::is_signed_v<I> || sizeof(I) < 8)) Value(I value)
        : content_(static_cast<std::int64_t>(value)) {}
    Value(std::uint64_t value);  // beyond the largest int64 it becomes a double
    Value(double value) : content_(value) {}
    Value(platform::Date value) : content_(value) {}
    Value(std::string value);
    Value(std::string_view value) : Value(std::string(value)) {}
    Value(const char* value) : Value(std::string(value)) {}
    Value(platform::Data value);
    Value(platform::Array value);
    Value(platform::Dictionary value);

    Type type() const { return static_cast<Type>(content_.index()); }
    bool isNull() const { return type() == Type::Null; }
    bool isNumber() const { return type() == Type::Integer || type() == Type::Double; }

    std::optional<bool> asBool() const;
    std::optional<std::int64_t> asInteger() const;  // an integer only
    std::optional<double> asNumber() const;         // an integer or a double
    std::optional<platform::Date> asDate() const;
    const std::string* asString() const;
    const platform::Data* asData() const;
    const platform::Array* asArray() const;
    const platform::Dictionary* asDictionary() const;

    // The entry of a dictionary; null when there is no such entry or this is not a dictionary.
    const Value& operator[](std::string_view key) const;

    // Compares deeply. Numbers compare by their numeric value; a boolean is not a number.
    bool operator==(const Value& other) const;

    // The text that "%@" prints: a string as it is, null as (null), dictionaries in the order of their keys.
    std::string description() const;

private:
    template <class T>
    using Shared = std::shared_ptr<const T>;
    template <class T>
    const T* shared() const;

    std::variant<std::monostate, bool, std::int64_t, double, platform::Date, Shared<std::string>,
                 Shared<platform::Data>, Shared<platform::Array>, Shared<platform::Dictionary>>
        content_;
};

// How deeply containers are nested in a value, itself included: 0 for a scalar, 1 for a flat array. Stops counting
// above the limit.
int nestingDepth(const Value& value, int limit);

}  // namespace vrx::platform
