#include <bit>
#include <cmath>
#include <string>
#include <unordered_map>
#include <vector>

#include "vrx/codec/binary_property_list.h"
#include "vrx/codec/binary_property_list_format.h"
#include "vrx/codec/core/unicode.h"
#include "vrx/codec/property_list_error.h"

namespace vrx::codec {

using namespace binary_property_list;
using platform::Result;
using platform::Value;

namespace {

std::size_t widthOf(std::uint64_t largest) {
    return largest <= 0xFF ? 1 : largest <= 0xFFFF ? 2 : largest <= 0xFFFF'FFFF ? 4 : 8;
}

// First numbers the objects, a container's children together, then writes them in that order. Equal texts are one
// object, and so are equal booleans.
class BinaryWriter {
public:
    Result<platform::Data> write(const Value& root) {
        objectOf(root);
        // The list grows during the loop: each container appends its children.
        for (std::size_t i = 0; i < objects_.size(); ++i) numberChildren(i);
        refWidth_ = widthOf(objects_.size() - 1);

        document_.assign(header.begin(), header.end());
        std::vector<std::size_t> offsets;
        offsets.reserve(objects_.size());
        for (const Object& object : objects_) {
            offsets.push_back(document_.size());
            if (!writeObject(object)) return unwritablePropertyList(unwritable_);
        }
        writeTable(offsets);
        return std::move(document_);
    }

private:
    struct Object {
        const Value* value;       // null for a text
        const std::string* text;  // null for every other value
        std::size_t firstRef = 0;
    };

    std::size_t objectOf(const Value& value) {
        if (const std::string* text = value.asString()) return objectOf(*text);
        if (const std::optional<bool> flag = value.asBool()) {
            std::size_t& number = booleans_[*flag ? 1 : 0];
            if (number == none) number = append({&value, nullptr});
            return number;
        }
        return append({&value, nullptr});
    }

    std::size_t objectOf(const std::string& text) {
        auto [known, isNew] = texts_.try_emplace(text, objects_.size());
        if (isNew) append({nullptr, &text});
        return known->second;
    }

    std::size_t append(Object object) {
        objects_.push_back(object);
        return objects_.size() - 1;
    }

    void numberChildren(std::size_t container) {
        objects_[container].firstRef = refs_.size();
        const Value* value = objects_[container].value;
        if (!value) return;
        if (const platform::Array* elements = value->asArray()) {
            for (const Value& element : *elements) refs_.push_back(objectOf(element));
        } else if (const platform::Dictionary* entries = value->asDictionary()) {
            for (const auto& entry : *entries) refs_.push_back(objectOf(entry.first));
            for (const auto& entry : *entries) refs_.push_back(objectOf(entry.second));
        }
    }

    // False when the object cannot be written.
    bool writeObject(const Object& object) {
        if (object.text) return writeText(*object.text);
        const Value& value = *object.value;
        switch (value.type()) {
            case Value::Type::Null: return fail("a null");
            case Value::Type::Bool: writeByte(*value.asBool() ? trueObject : falseObject); return true;
            case Value::Type::Integer: writeInteger(*value.asInteger()); return true;
            case Value::Type::Double:
                writeByte(Real | 3);
                writeNumber(std::bit_cast<std::uint64_t>(*value.asNumber()), 8);
                return true;
            case Value::Type::Date: return writeDate(*value.asDate());
            case Value::Type::Data:
                writeStart(binary_property_list::Data, value.asData()->size());
                document_.insert(document_.end(), value.asData()->begin(), value.asData()->end());
                return true;
            case Value::Type::Array:
                writeStart(Array, value.asArray()->size());
                writeRefs(object.firstRef, value.asArray()->size());
                return true;
            case Value::Type::Dictionary:
                writeStart(Dictionary, value.asDictionary()->size());
                writeRefs(object.firstRef, 2 * value.asDictionary()->size());
                return true;
            case Value::Type::String: return writeText(*value.asString());
        }
        return false;
    }

    // Up to four bytes are unsigned, eight are signed.
    void writeInteger(std::int64_t integer) {
        const std::size_t width = widthOf(static_cast<std::uint64_t>(integer));
        writeByte(static_cast<std::uint8_t>(Integer | std::countr_zero(width)));
        writeNumber(static_cast<std::uint64_t>(integer), width);
    }

    bool writeDate(platform::Date date) {
        const double seconds = platform::epochSeconds(date) - epochOfDates;
        if (!std::isfinite(seconds)) return fail("a date that is not finite");
        writeByte(dateObject);
        writeNumber(std::bit_cast<std::uint64_t>(seconds), 8);
        return true;
    }

    bool writeText(const std::string& text) {
        if (isAscii(text)) {
            writeStart(AsciiString, text.size());
            document_.insert(document_.end(), text.begin(), text.end());
            return true;
        }
        const std::optional<std::u16string> units = utf16FromUtf8(text);
        if (!units) return fail("text that is not UTF-8");
        writeStart(Utf16String, units->size());
        for (char16_t unit : *units) writeNumber(unit, 2);
        return true;
    }

    void writeStart(Kind kind, std::size_t count) {
        writeByte(static_cast<std::uint8_t>(kind | (count < countFollows ? count : countFollows)));
        if (count >= countFollows) writeInteger(static_cast<std::int64_t>(count));
    }

    void writeRefs(std::size_t first, std::size_t count) {
        for (std::size_t i = first; i < first + count; ++i) writeNumber(refs_[i], refWidth_);
    }

    void writeTable(const std::vector<std::size_t>& offsets) {
        const std::size_t table = document_.size();
        const std::size_t offsetWidth = widthOf(table);
        for (std::size_t offset : offsets) writeNumber(offset, offsetWidth);
        writeNumber(0, offsetWidthAt);  // the unused bytes and the sort version
        writeByte(static_cast<std::uint8_t>(offsetWidth));
        writeByte(static_cast<std::uint8_t>(refWidth_));
        writeNumber(objects_.size(), 8);
        writeNumber(0, 8);  // the root
        writeNumber(table, 8);
    }

    void writeByte(std::uint8_t byte) { document_.push_back(byte); }

    void writeNumber(std::uint64_t number, std::size_t width) {
        while (width-- > 0) writeByte(static_cast<std::uint8_t>(number >> (8 * width)));
    }

    bool fail(const char* what) {
        unwritable_ = what;
        return false;
    }

    static constexpr std::size_t none = static_cast<std::size_t>(-1);

    std::vector<Object> objects_;
    std::vector<std::size_t> refs_;
    std::unordered_map<std::string_view, std::size_t> texts_;
    std::size_t booleans_[2] = {none, none};
    std::size_t refWidth_ = 1;
    platform::Data document_;
    const char* unwritable_ = "";
};

}  // namespace

Result<platform::Data> serializeBinaryPropertyList(const Value& root) {
    return BinaryWriter().write(root);
}

}  // namespace vrx::codec
