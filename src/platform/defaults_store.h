// The agent's persistent settings by key and, beneath them, the registered defaults, which are registered at every
// start and never stored. Single reads and writes are safe from any thread and any process; update() makes a read and
// the write that follows it one step.
#pragma once

#include <cstdint>
#include <functional>
#include <optional>
#include <string>
#include <string_view>

#include "vrx/platform/value.h"

namespace vrx::platform {

class DefaultsStore {
public:
    virtual ~DefaultsStore() = default;

    // The stored value, else the registered one, else null. A store that cannot be read counts as empty.
    virtual Value get(std::string_view key) const = 0;
    // Storing null removes the key. A failed write is logged and keeps the earlier value.
    virtual void set(std::string_view key, Value value) = 0;
    // Stores the function's result for the present value; no other write to the key comes in between. The function may
    // be called more than once and must not use the store.
    virtual void update(std::string_view key, const std::function<Value(const Value&)>& change) = 0;
    // Adds to the registered values; they live as long as the process.
    virtual void registerDefaults(const Dictionary& values) = 0;
    // Every key with its value, stored before registered.
    virtual Dictionary dictionaryRepresentation() const = 0;

    void remove(std::string_view key) { set(key, nullptr); }

    // Typed reads. integer() and number() also read the digits that a string begins with, and return 0 for any other
    // type. boolean() reads flags as number_text.h describes. string() and date() return null for any other type.
    std::int64_t integer(std::string_view key) const;
    double number(std::string_view key) const;
    bool boolean(std::string_view key) const;
    std::optional<std::string> string(std::string_view key) const;
    std::optional<Date> date(std::string_view key) const;
    // Null when the value is not a dictionary.
    Value dictionary(std::string_view key) const;
};

}  // namespace vrx::platform
