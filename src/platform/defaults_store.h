// Persistent settings of the agent's domain by key, over defaults that are registered at every start and never stored.
// Single reads and writes are safe from any thread and any process; update() makes a read and the write that follows
// one step.
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

    // The stored value, else the registered one, else null. A store that cannot be read reads as one that holds
    // nothing.
    virtual Value get(std::string_view key) const = 0;
    // Storing null removes the key. A failed write is logged and leaves the earlier value.
    virtual void set(std::string_view key, Value value) = 0;
    // Stores what the function makes of the present value, with no other write to the key in between. The function may
    // be called more than once and must not use the store.
    virtual void update(std::string_view key, const std::function<Value(const Value&)>& change) = 0;
    // Adds to the registered values; they live as long as the process.
    virtual void registerDefaults(const Dictionary& values) = 0;
    // Every key with its value, stored before registered.
    virtual Dictionary dictionaryRepresentation() const = 0;

    void remove(std::string_view key) { set(key, nullptr); }

    // Typed reads: a number as such or out of a string's leading digits, else 0; a flag as number_text.h has it; any
    // other type than the one asked for is nothing.
    std::int64_t integer(std::string_view key) const;
    double number(std::string_view key) const;
    bool boolean(std::string_view key) const;
    std::optional<std::string> string(std::string_view key) const;
    std::optional<Date> date(std::string_view key) const;
    // Null when the value is no dictionary.
    Value dictionary(std::string_view key) const;
};

}  // namespace vrx::platform
