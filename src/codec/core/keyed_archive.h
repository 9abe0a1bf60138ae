// Keyed archives as property values: how records cross the IPC boundary. Any thread may call.
//
// An archived object is a dictionary of its keys, with the name of its class under "$class". The values in objects come
// from others, such as a server. In their dictionaries a key that begins with "$" gets a second one in front, so that
// no value can pass for an object. Nulls and data are left out of values, because decoding refuses them.
#pragma once

#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "vrx/platform/error.h"
#include "vrx/platform/keyed_archiver.h"
#include "vrx/platform/value.h"

namespace vrx::codec {

// The key of an archived object's class.
inline constexpr std::string_view classKey = "$class";

platform::Value archive(const platform::Archivable& object);

template <class T>
platform::Value archive(const std::vector<std::shared_ptr<T>>& objects) {
    platform::Array list;
    list.reserve(objects.size());
    for (const std::shared_ptr<T>& object : objects) list.push_back(archive(*object));
    return list;
}

// A value by itself, archived as within an object. It shares what needs no change. Null for a null and for data.
platform::Value archiveValue(const platform::Value& value);
// The value in an archive. Anything that is not allowed, at any depth, is an error, and so is an object.
platform::Result<platform::Value> unarchiveValue(const platform::Value& archive, platform::AllowedKinds allowed);

// The first reason for which an archive was rejected, with the keys that lead to the place. The decoders of an archive
// share one.
class Rejection {
public:
    // The place is empty at the root.
    void note(const std::string& place, const std::string& reason);
    // The first reason; a general one if the class refused to make an object without a reason.
    const platform::Error& error();

private:
    std::optional<platform::Error> error_;
};

class KeyedUnarchiver final : public platform::KeyedDecoder {
public:
    // Decodes an object of exactly that class; any other value rejects at once. Archive and rejection must outlive
    // this.
    KeyedUnarchiver(const platform::Value& archive, std::string_view className, std::string place,
                    Rejection& rejection);

    platform::Value decodeValue(std::string_view key, platform::AllowedKinds allowed) override;
    std::int64_t decodeInteger(std::string_view key) override;

private:
    std::unique_ptr<KeyedDecoder> openObject(std::string_view key, std::string_view className) override;
    std::string placeOf(std::string_view key) const;
    void reject(const std::string& place, const std::string& reason);

    const platform::Value& archive_;
    const std::string place_;
    Rejection& rejection_;
};

// Whether an archive is nested deeper than any that is made here; if so, notes that.
bool isTooDeep(const platform::Value& archive, Rejection& rejection);

// The object of exactly class T; null when the class makes none of the archive. Anything that the class does not admit
// rejects the whole archive, and the error names key and class.
template <class T>
platform::Result<std::shared_ptr<T>> unarchive(const platform::Value& archive) {
    Rejection rejection;
    if (isTooDeep(archive, rejection)) return rejection.error();
    KeyedUnarchiver decoder(archive, T::archiveClassName, {}, rejection);
    std::shared_ptr<T> object = decoder.isRejected() ? nullptr : T::initWithCoder(decoder);
    if (decoder.isRejected()) return rejection.error();
    return object;
}

// A list of objects, each of exactly class T. An element that makes no object rejects the list.
template <class T>
platform::Result<std::vector<std::shared_ptr<T>>> unarchiveList(const platform::Value& archive) {
    Rejection rejection;
    const platform::Array* elements = archive.asArray();
    if (!elements) rejection.note({}, "not a list");
    if (!elements || isTooDeep(archive, rejection)) return rejection.error();

    std::vector<std::shared_ptr<T>> objects;
    objects.reserve(elements->size());
    for (const platform::Value& element : *elements) {
        KeyedUnarchiver decoder(element, T::archiveClassName, std::to_string(objects.size()), rejection);
        std::shared_ptr<T> object = decoder.isRejected() ? nullptr : T::initWithCoder(decoder);
        if (decoder.isRejected() || !object) return rejection.error();
        objects.push_back(std::move(object));
    }
    return objects;
}

}  // namespace vrx::codec
