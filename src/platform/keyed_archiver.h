// Keyed archiving with secure decoding: how records cross the IPC boundary. An object is archived as a set of keys
// under the name of its class. Decoding names for each key the class, or the kinds of values, that it admits; anything
// else rejects the whole archive. An encoder or decoder belongs to one thread.
#pragma once

#include <cstdint>
#include <initializer_list>
#include <memory>
#include <string_view>

#include "vrx/platform/archivable.h"
#include "vrx/platform/value.h"

namespace vrx::platform {

class KeyedEncoder {
public:
    virtual ~KeyedEncoder() = default;
    // A null value or object leaves the key out. Nulls and data inside a value are left out as well, because decoding
    // would refuse them.
    virtual void encodeObject(std::string_view key, const Value& value) = 0;
    virtual void encodeObject(std::string_view key, const Archivable* object) = 0;
    virtual void encodeInteger(std::string_view key, std::int64_t value) = 0;
};

// The types that a decoded value may have, and may hold at any depth. Numbers include booleans.
class AllowedKinds {
public:
    enum Kind : unsigned { Strings = 1, Numbers = 2, Dates = 4, Arrays = 8, Dictionaries = 16 };
    constexpr AllowedKinds(std::initializer_list<Kind> kinds) {
        for (Kind kind : kinds) kinds_ |= kind;
    }
    // Whether the value, and everything in it, is of an allowed kind. Nulls and data never are.
    bool admit(const Value& value) const;

private:
    unsigned kinds_ = 0;
};

class KeyedDecoder {
public:
    virtual ~KeyedDecoder() = default;

    // The value under the key, null when there is none. A value that is not allowed rejects the archive.
    virtual Value decodeValue(std::string_view key, AllowedKinds allowed) = 0;
    // 0 when there is none.
    virtual std::int64_t decodeInteger(std::string_view key) = 0;

    // The object of exactly class T under the key, null when there is none. An object of any other class rejects the
    // archive.
    template <class T>
    std::shared_ptr<T> decodeObject(std::string_view key) {
        std::unique_ptr<KeyedDecoder> object = openObject(key, T::archiveClassName);
        if (!object) return nullptr;
        std::shared_ptr<T> decoded = T::initWithCoder(*object);
        if (object->isRejected()) reject();
        return decoded;
    }

    // A rejected archive makes no object, whatever was decoded from it.
    void reject() { rejected_ = true; }
    bool isRejected() const { return rejected_; }

protected:
    // The decoder of the object under the key. Null when the key is absent; null, and the archive rejected, when the
    // object is of another class.
    virtual std::unique_ptr<KeyedDecoder> openObject(std::string_view key, std::string_view className) = 0;

private:
    bool rejected_ = false;
};

}  // namespace vrx::platform
