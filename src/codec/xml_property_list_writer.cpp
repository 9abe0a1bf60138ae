#include <charconv>
#include <cmath>
#include <string>

#include "vrx/codec/base64.h"
#include "vrx/codec/core/unicode.h"
#include "vrx/codec/iso_date.h"
#include "vrx/codec/property_list_error.h"
#include "vrx/codec/xml_property_list.h"

namespace vrx::codec {

using platform::Data;
using platform::Result;
using platform::Value;

namespace {

constexpr std::string_view head =
    "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n"
    "<plist version=\"1.0\">\n";

template <class Number>
std::string textOf(Number number) {
    char digits[32];
    return {digits, std::to_chars(digits, digits + sizeof digits, number).ptr};
}

std::string realText(double number) {
    if (std::isnan(number)) return "nan";
    if (std::isinf(number)) return number > 0 ? "+infinity" : "-infinity";
    return textOf(number);
}

bool isXmlCharacter(char32_t c) {
    return c >= 0x20 ? c != 0xFFFE && c != 0xFFFF : c == '\t' || c == '\n' || c == '\r';
}

class XmlWriter {
public:
    // False when the value cannot be written.
    bool write(const Value& value, std::size_t depth = 0) {
        switch (value.type()) {
            case Value::Type::Null: return fail("a null");
            case Value::Type::Bool: return line(depth, *value.asBool() ? "<true/>" : "<false/>");
            case Value::Type::Integer: return element(depth, "integer", textOf(*value.asInteger()));
            case Value::Type::Double: return element(depth, "real", realText(*value.asNumber()));
            case Value::Type::String: return textElement(depth, "string", *value.asString());
            case Value::Type::Data: return element(depth, "data", base64FromData(*value.asData()));
            case Value::Type::Date: {
                const std::optional<std::string> text = isoTextFromDate(*value.asDate());
                return text ? element(depth, "date", *text) : fail("this date in XML");
            }
            case Value::Type::Array:
                if (value.asArray()->empty()) return line(depth, "<array/>");
                line(depth, "<array>");
                for (const Value& child : *value.asArray())
                    if (!write(child, depth + 1)) return false;
                return line(depth, "</array>");
            case Value::Type::Dictionary:
                if (value.asDictionary()->empty()) return line(depth, "<dict/>");
                line(depth, "<dict>");
                for (const auto& [key, child] : *value.asDictionary())
                    if (!textElement(depth + 1, "key", key) || !write(child, depth + 1)) return false;
                return line(depth, "</dict>");
        }
        return false;
    }

    const std::string& text() const { return text_; }
    const std::string& unwritable() const { return unwritable_; }

private:
    bool line(std::size_t depth, std::string_view content) {
        text_.append(depth, '\t').append(content).append("\n");
        return true;
    }

    bool element(std::size_t depth, const std::string& name, std::string_view content) {
        return line(depth, "<" + name + ">" + std::string(content) + "</" + name + ">");
    }

    bool textElement(std::size_t depth, const std::string& name, std::string_view rest) {
        std::string escaped;
        escaped.reserve(rest.size());
        while (!rest.empty()) {
            const std::string_view before = rest;
            const std::optional<char32_t> character = takeCharacter(rest);
            if (!character) return fail("text that is not UTF-8");
            if (!isXmlCharacter(*character)) return fail("this character in XML");
            switch (*character) {
                case '<': escaped += "&lt;"; break;
                case '>': escaped += "&gt;"; break;
                case '&': escaped += "&amp;"; break;
                case '\r': escaped += "&#13;"; break;  // unescaped it would be read as a line feed
                default: escaped += before.substr(0, before.size() - rest.size());
            }
        }
        return element(depth, name, escaped);
    }

    bool fail(const char* what) {
        unwritable_ = what;
        return false;
    }

    std::string text_{head};
    std::string unwritable_;
};

}  // namespace

Result<Data> serializeXmlPropertyList(const Value& root) {
    XmlWriter writer;
    if (!writer.write(root)) return unwritablePropertyList(writer.unwritable());
    Data document(writer.text().begin(), writer.text().end());
    constexpr std::string_view tail = "</plist>\n";
    document.insert(document.end(), tail.begin(), tail.end());
    return document;
}

}  // namespace vrx::codec
