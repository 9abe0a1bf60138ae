#include "vrx/codec/core/keyed_archive.h"

#include <algorithm>
#include <cassert>
#include <cerrno>

#include "vrx/platform/limits.h"

namespace vrx::codec {

using platform::AllowedKinds;
using platform::Array;
using platform::Dictionary;
using platform::Result;
using platform::Value;

namespace {

// The depth of a document, within a record, within an info, within a list.
constexpr int archiveDepth = platform::limits::documentDepth + 4;

// Keys that begin with it belong to the archive: the class, and escaped keys.
constexpr char reserved = '$';

bool isLeftOut(const Value& value) {
    return value.type() == Value::Type::Null || value.type() == Value::Type::Data;
}

// Keys are in order, so that one look finds those that begin with the reserved character.
bool hasReservedKey(const Dictionary& dictionary) {
    const auto first = dictionary.lower_bound(std::string_view(&reserved, 1));
    return first != dictionary.end() && first->first.starts_with(reserved);
}

// Whether a value is archived unchanged. One pass, which makes nothing.
bool isArchivedAsIs(const Value& value) {
    if (const Array* elements = value.asArray()) return std::ranges::all_of(*elements, isArchivedAsIs);
    if (const Dictionary* entries = value.asDictionary())
        return !hasReservedKey(*entries) &&
               std::ranges::all_of(*entries, [](const auto& entry) { return isArchivedAsIs(entry.second); });
    return !isLeftOut(value);
}

class KeyedArchiver final : public platform::KeyedEncoder {
public:
    explicit KeyedArchiver(std::string_view className) { entries_.emplace(classKey, className); }

    void encodeObject(std::string_view key, const Value& value) override {
        if (!isLeftOut(value)) set(key, archiveValue(value));
    }
    void encodeObject(std::string_view key, const platform::Archivable* object) override {
        if (object) set(key, archive(*object));
    }
    void encodeInteger(std::string_view key, std::int64_t value) override { set(key, value); }

    Value takeArchive() { return std::move(entries_); }

private:
    void set(std::string_view key, Value value) {
        assert(!key.starts_with(reserved));
        entries_.insert_or_assign(std::string(key), std::move(value));
    }

    Dictionary entries_;
};

// Looks for what an archived value cannot hold: an object, or another unescaped key. Also says whether there are
// escaped keys.
enum class ReservedKeys { None, Escaped, Foreign };
ReservedKeys reservedKeys(const Value& value) {
    auto found = ReservedKeys::None;
    if (const Array* elements = value.asArray()) {
        for (const Value& element : *elements) found = std::max(found, reservedKeys(element));
    } else if (const Dictionary* entries = value.asDictionary()) {
        for (const auto& [key, element] : *entries) {
            if (key.starts_with(reserved))
                found = std::max(found, key.starts_with("$$") ? ReservedKeys::Escaped : ReservedKeys::Foreign);
            found = std::max(found, reservedKeys(element));
        }
    }
    return found;
}

Value withoutEscapes(const Value& value) {
    if (const Array* elements = value.asArray()) {
        Array copy;
        copy.reserve(elements->size());
        for (const Value& element : *elements) copy.push_back(withoutEscapes(element));
        return copy;
    }
    if (const Dictionary* entries = value.asDictionary()) {
        Dictionary copy;
        for (const auto& [key, element] : *entries)
            copy.emplace(key.starts_with(reserved) ? key.substr(1) : key, withoutEscapes(element));
        return copy;
    }
    return value;
}

// What was found in a rejected archive, for people: the class of an object, the kind of another value.
std::string kindOf(const Value& value) {
    switch (value.type()) {
        case Value::Type::Null: return "a null";
        case Value::Type::Bool: return "a boolean";
        case Value::Type::Integer:
        case Value::Type::Double: return "a number";
        case Value::Type::Date: return "a date";
        case Value::Type::String: return "a string";
        case Value::Type::Data: return "data";
        case Value::Type::Array: return "a list";
        case Value::Type::Dictionary: break;
    }
    const std::string* className = value[classKey].asString();
    return className ? *className : "a dictionary";
}

// Why the value cannot be decoded; empty when it can.
std::string refusal(const Value& value, AllowedKinds allowed, ReservedKeys keys) {
    if (keys == ReservedKeys::Foreign)
        return (value[classKey].isNull() ? "an object within " : "") + kindOf(value) +
               " where a plain value is expected";
    if (!allowed.admit(value)) return kindOf(value) + " that is not, or holds what is not, of an allowed kind";
    return {};
}

Result<Value> decoded(const Value& value, AllowedKinds allowed, const std::string& place, Rejection& rejection) {
    const ReservedKeys keys = reservedKeys(value);
    if (const std::string reason = refusal(value, allowed, keys); !reason.empty()) {
        rejection.note(place, reason);
        return rejection.error();
    }
    return keys == ReservedKeys::Escaped ? withoutEscapes(value) : value;
}

}  // namespace

Value archive(const platform::Archivable& object) {
    KeyedArchiver archiver(object.className());
    object.encodeWithCoder(archiver);
    return archiver.takeArchive();
}

Value archiveValue(const Value& value) {
    if (isLeftOut(value)) return {};
    if (isArchivedAsIs(value)) return value;
    if (const Array* elements = value.asArray()) {
        Array kept;
        kept.reserve(elements->size());
        for (const Value& element : *elements)
            if (!isLeftOut(element)) kept.push_back(archiveValue(element));
        return kept;
    }
    Dictionary kept;
    for (const auto& [key, element] : *value.asDictionary())
        if (!isLeftOut(element)) kept.emplace(key.starts_with(reserved) ? reserved + key : key, archiveValue(element));
    return kept;
}

Result<Value> unarchiveValue(const Value& archive, AllowedKinds allowed) {
    Rejection rejection;
    if (isTooDeep(archive, rejection)) return rejection.error();
    return decoded(archive, allowed, {}, rejection);
}

bool isTooDeep(const Value& archive, Rejection& rejection) {
    if (platform::nestingDepth(archive, archiveDepth) <= archiveDepth) return false;
    rejection.note({}, "nested too deeply");
    return true;
}

void Rejection::note(const std::string& place, const std::string& reason) {
    if (error_) return;
    const std::string where = place.empty() ? "the root" : "key \"" + place + "\"";
    error_ = platform::Error{platform::error_domain::archive, EBADMSG, "archive rejected at " + where + ": " + reason};
}

const platform::Error& Rejection::error() {
    note({}, "not an object that its class accepts");
    return *error_;
}

KeyedUnarchiver::KeyedUnarchiver(const Value& archive, std::string_view className, std::string place,
                                 Rejection& rejection)
    : archive_(archive), place_(std::move(place)), rejection_(rejection) {
    const std::string* actual = archive[classKey].asString();
    if (!actual || *actual != className)
        reject(place_, kindOf(archive) + " where " + std::string(className) + " is expected");
}

std::string KeyedUnarchiver::placeOf(std::string_view key) const {
    return place_.empty() ? std::string(key) : place_ + "." + std::string(key);
}

void KeyedUnarchiver::reject(const std::string& place, const std::string& reason) {
    rejection_.note(place, reason);
    KeyedDecoder::reject();
}

Value KeyedUnarchiver::decodeValue(std::string_view key, AllowedKinds allowed) {
    const Value& value = archive_[key];
    if (value.isNull()) return {};
    Result<Value> content = decoded(value, allowed, placeOf(key), rejection_);
    if (content) return *std::move(content);
    KeyedDecoder::reject();
    return {};
}

std::int64_t KeyedUnarchiver::decodeInteger(std::string_view key) {
    const Value& value = archive_[key];
    if (value.isNull()) return 0;
    const std::optional<std::int64_t> integer = value.asInteger();
    if (!integer) reject(placeOf(key), kindOf(value) + " where an integer is expected");
    return integer.value_or(0);
}

std::unique_ptr<platform::KeyedDecoder> KeyedUnarchiver::openObject(std::string_view key, std::string_view className) {
    const Value& value = archive_[key];
    if (value.isNull()) return nullptr;
    auto object = std::make_unique<KeyedUnarchiver>(value, className, placeOf(key), rejection_);
    if (!object->isRejected()) return object;
    KeyedDecoder::reject();
    return nullptr;
}

}  // namespace vrx::codec
