#include <algorithm>
#include <bit>
#include <cmath>
#include <optional>
#include <string>
#include <unordered_map>

#include "vrx/codec/binary_property_list.h"
#include "vrx/codec/binary_property_list_format.h"
#include "vrx/codec/core/unicode.h"
#include "vrx/codec/property_list_error.h"
#include "vrx/platform/limits.h"

namespace vrx::codec {

using namespace binary_property_list;
using platform::Result;
using platform::Value;
namespace limits = platform::limits;

namespace {

// Reads from untrusted bytes. The first complaint ends the reading; every step after it fails too.
//
// Objects may share others, overlap, and refer in circles. Each use of an object counts as a value, so that circles and
// sharing end at the limits of depth and count. Texts and data are made once for each place in the document and then
// shared, but their bytes count at each use: whoever copies or prints the value pays for each.
class BinaryReader {
public:
    explicit BinaryReader(const platform::Data& document) : document_(document) {}

    Result<Value> read() {
        Value root;
        if (readTrailer()) {
            const std::size_t rootRef = document_.size() - trailerBytes + rootAt;
            root = readObject(number(rootRef, 8), 1, rootRef);
        }
        if (!complaint_.empty()) return invalidPropertyList("byte " + std::to_string(place_), complaint_);
        return root;
    }

private:
    // What is at an object's offset: its kind, and the bytes or references that its first byte and count announce.
    struct Object {
        std::size_t offset;
        std::uint8_t marker;
        std::size_t count;    // elements, characters or bytes
        std::size_t content;  // where the elements, characters or bytes begin

        Kind kind() const { return static_cast<Kind>(marker & 0xF0); }
    };

    bool complain(std::size_t place, const char* complaint) {
        if (complaint_.empty()) {
            place_ = place;
            complaint_ = complaint;
        }
        return false;
    }

    std::uint64_t number(std::size_t at, std::size_t width) const {
        std::uint64_t result = 0;
        for (std::size_t i = 0; i < width; ++i) result = result << 8 | document_[at + i];
        return result;
    }

    bool readTrailer() {
        if (document_.size() < header.size() + trailerBytes ||
            !std::equal(header.begin(), header.end(), document_.begin()))
            return complain(0, "neither the header nor the size of a binary property list, version 00");
        const std::size_t trailer = document_.size() - trailerBytes;
        offsetWidth_ = document_[trailer + offsetWidthAt];
        refWidth_ = document_[trailer + refWidthAt];
        objectCount_ = number(trailer + objectCountAt, 8);
        const std::uint64_t table = number(trailer + offsetTableAt, 8);
        const bool widths = offsetWidth_ >= 1 && offsetWidth_ <= 8 && refWidth_ >= 1 && refWidth_ <= 8;
        if (!widths || table < header.size() || table > trailer || objectCount_ > (trailer - table) / offsetWidth_)
            return complain(trailer, "the trailer does not fit the document");
        offsetTable_ = static_cast<std::size_t>(table);
        contents_.reserve(static_cast<std::size_t>(std::min<std::uint64_t>(objectCount_, limits::documentValues)));
        return true;
    }

    // Finds the object's offset; complains at the reference.
    bool locate(std::uint64_t object, std::size_t referredAt, std::size_t& offset) {
        if (object >= objectCount_) return complain(referredAt, "a reference to no object");
        const std::size_t entry = offsetTable_ + static_cast<std::size_t>(object) * offsetWidth_;
        const std::uint64_t place = number(entry, offsetWidth_);
        if (place < header.size() || place >= offsetTable_) return complain(entry, "an object outside of the objects");
        offset = static_cast<std::size_t>(place);
        return true;
    }

    bool open(std::size_t offset, Object& object) {
        object = {offset, document_[offset], document_[offset] & 0x0Fu, offset + 1};
        if (object.kind() < Data || object.count != countFollows) return true;

        const std::size_t left = offsetTable_ - object.content;
        const std::uint8_t marker = left > 0 ? document_[object.content] : std::uint8_t{0};
        const std::size_t width = std::size_t{1} << (marker & 0x0F);
        if ((marker & 0xF0) != Integer || (marker & 0x0F) > 3 || left < 1 + width)
            return complain(offset, "a broken count");
        const std::uint64_t count = number(object.content + 1, width);
        object.content += 1 + width;
        if (count > offsetTable_) return complain(offset, "a count beyond the document");
        object.count = static_cast<std::size_t>(count);
        return true;
    }

    // Whether so many units of the width lie within the objects. The count may be any number up to the document's size.
    bool fits(const Object& object, std::size_t count, std::size_t width) {
        if (count <= (offsetTable_ - object.content) / width) return true;
        return complain(object.offset, "contents that end beyond the objects");
    }

    Value readObject(std::uint64_t reference, int depth, std::size_t referredAt) {
        Object object;
        std::size_t offset = 0;
        if (!locate(reference, referredAt, offset) || !open(offset, object)) return {};
        // Counted before anything is made of it, so that objects which share or contain each other end at the limit.
        if (++values_ > limits::documentValues) {
            complain(object.offset, "too many values");
            return {};
        }
        switch (object.kind()) {
            case Integer: return readInteger(object);
            case Data:
            case AsciiString:
            case Utf16String: return readBytes(object);
            case Array:
            case Dictionary:
                if (depth > limits::documentDepth) {
                    complain(object.offset, "nested too deeply");
                    return {};
                }
                return object.kind() == Array ? readArray(object, depth) : readDictionary(object, depth);
            default: return readScalar(object);
        }
    }

    Value readScalar(const Object& object) {
        if (object.marker == falseObject || object.marker == trueObject) return object.marker == trueObject;
        if (object.marker == (Real | 2) && fits(object, 1, 4))
            return static_cast<double>(std::bit_cast<float>(static_cast<std::uint32_t>(number(object.content, 4))));
        if (object.marker == (Real | 3) && fits(object, 1, 8)) return std::bit_cast<double>(number(object.content, 8));
        if (object.marker == dateObject && fits(object, 1, 8)) {
            const auto seconds = std::bit_cast<double>(number(object.content, 8));
            if (std::isfinite(seconds)) return platform::dateFromEpoch(seconds + epochOfDates);
            complain(object.offset, "a date that is not finite");
        }
        complain(object.offset, "an object of a kind that is not supported");
        return {};
    }

    Value readInteger(const Object& object) {
        const std::size_t width = std::size_t{1} << object.count;
        if (object.count > 4) {
            complain(object.offset, "an integer too wide");
        } else if (fits(object, 1, width)) {
            // Up to four bytes are unsigned, eight are signed, and sixteen hold what is beyond int64.
            if (width < 16) return static_cast<std::int64_t>(number(object.content, width));
            if (number(object.content, 8) == 0) return number(object.content + 8, 8);
            complain(object.offset, "an integer out of range");
        }
        return {};
    }

    Value readBytes(const Object& object) {
        auto [known, isNew] = contents_.try_emplace(object.offset);
        if (!spend(object, object.count * widthOf(object))) return {};
        if (isNew) known->second = makeBytes(object);
        return known->second;
    }

    static std::size_t widthOf(const Object& object) { return object.kind() == Utf16String ? 2 : 1; }

    Value makeBytes(const Object& object) {
        const std::size_t width = widthOf(object);
        if (!fits(object, object.count, width)) return {};  // before any memory is taken
        const std::uint8_t* begin = document_.data() + object.content;
        const std::uint8_t* end = begin + object.count * width;
        if (object.kind() == Data) return platform::Data(begin, end);

        std::optional<std::string> text;
        if (object.kind() == AsciiString) {
            text.emplace(begin, end);
            if (!isAscii(*text)) text.reset();
        } else {
            std::u16string units(object.count, u'\0');
            for (std::size_t i = 0; i < object.count; ++i)
                units[i] = static_cast<char16_t>(number(object.content + 2 * i, 2));
            text = utf8FromUtf16(units);
        }
        if (text) return *std::move(text);
        complain(object.offset, "text that is not valid");
        return {};
    }

    Value readArray(const Object& object, int depth) {
        if (!fits(object, object.count, refWidth_)) return {};
        platform::Array elements;
        for (std::size_t i = 0; i < object.count && complaint_.empty(); ++i)
            elements.push_back(readReferred(object, i, depth + 1));
        return elements;
    }

    Value readDictionary(const Object& object, int depth) {
        if (!fits(object, 2 * object.count, refWidth_)) return {};
        platform::Dictionary entries;
        for (std::size_t i = 0; i < object.count && complaint_.empty(); ++i) {
            const Value key = readKey(object, i);
            const std::string* name = key.asString();
            if (!name) break;
            // Most writers, ours among them, write keys in order, so that each belongs at the end.
            entries.insert_or_assign(entries.end(), *name, readReferred(object, object.count + i, depth + 1));
        }
        return entries;
    }

    Value readKey(const Object& dictionary, std::size_t index) {
        const std::size_t at = dictionary.content + index * refWidth_;
        Object object;
        std::size_t offset = 0;
        if (!locate(number(at, refWidth_), at, offset) || !open(offset, object)) return {};
        if (object.kind() != AsciiString && object.kind() != Utf16String) {
            complain(at, "a key that is no string");
            return {};
        }
        return readBytes(object);
    }

    Value readReferred(const Object& container, std::size_t index, int depth) {
        const std::size_t at = container.content + index * refWidth_;
        return readObject(number(at, refWidth_), depth, at);
    }

    bool spend(const Object& object, std::size_t bytes) {
        if (bytes > bytesLeft_) return complain(object.offset, "contents too large");
        bytesLeft_ -= bytes;
        return true;
    }

    const platform::Data& document_;
    std::size_t offsetWidth_ = 0;
    std::size_t refWidth_ = 0;
    std::uint64_t objectCount_ = 0;
    std::size_t offsetTable_ = 0;

    std::unordered_map<std::size_t, Value> contents_;  // texts and data by their offsets
    std::size_t values_ = 0;
    std::size_t bytesLeft_ = 2 * limits::documentBytes;
    std::string complaint_;
    std::size_t place_ = 0;
};

}  // namespace

bool isBinaryPropertyList(const platform::Data& document) {
    return document.size() >= family.size() && std::equal(family.begin(), family.end(), document.begin());
}

Result<Value> parseBinaryPropertyList(const platform::Data& document) {
    return BinaryReader(document).read();
}

}  // namespace vrx::codec
