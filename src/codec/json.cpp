#include "vrx/codec/json.h"

#include <cerrno>
#include <charconv>
#include <cmath>
#include <iterator>
#include <nlohmann/json.hpp>

#include "vrx/codec/base64.h"
#include "vrx/codec/core/unicode.h"
#include "vrx/codec/iso_date.h"
#include "vrx/codec/value_builder.h"
#include "vrx/platform/limits.h"
#include "vrx/platform/text.h"

namespace vrx::codec {

using platform::Error;
using platform::Result;
using platform::Value;

namespace {

// An iterator over the document that records how far the parser has read, for the error's text.
class TracedByte {
public:
    using iterator_category = std::input_iterator_tag;
    using value_type = char;
    using difference_type = std::ptrdiff_t;
    using pointer = const char*;
    using reference = const char&;

    TracedByte(const char* at, const char** trace) : at_(at), trace_(trace) {}
    reference operator*() const { return *at_; }
    TracedByte& operator++() {
        *trace_ = ++at_;
        return *this;
    }
    bool operator==(const TracedByte& other) const { return at_ == other.at_; }
    bool operator!=(const TracedByte& other) const { return at_ != other.at_; }

private:
    const char* at_;
    const char** trace_;
};

class JsonReader {
    using Json = nlohmann::json;

public:
    // The events of nlohmann::json; false ends the parse.
    bool null() { return add({}); }
    bool boolean(bool value) { return add(value); }
    bool number_integer(Json::number_integer_t value) { return add(value); }
    bool number_unsigned(Json::number_unsigned_t value) { return add(value); }
    bool number_float(Json::number_float_t value, const std::string&) { return add(value); }
    bool string(std::string& value) { return add(std::move(value)); }
    bool binary(Json::binary_t&) { return false; }  // not in JSON text
    bool start_object(std::size_t) { return withinLimit(builder_.beginDictionary()); }
    bool start_array(std::size_t) { return withinLimit(builder_.beginArray()); }
    bool key(std::string& name) {
        builder_.key(std::move(name));
        return true;
    }
    bool end_object() { return end(); }
    bool end_array() { return end(); }
    bool parse_error(std::size_t, const std::string&, const nlohmann::detail::exception& failure) {
        complaint_ = reason(failure.what());
        return false;
    }

    Value takeRoot() { return builder_.takeRoot(); }
    const std::string& complaint() const { return complaint_; }

private:
    bool add(Value&& value) { return withinLimit(builder_.add(std::move(value))); }
    bool end() {
        builder_.end();
        return true;
    }
    bool withinLimit(bool within) {
        if (!within) complaint_ = builder_.complaint();
        return within;
    }

    // The library says "… while parsing value - REASON; last read: '…'; expected …". Only for a number out of range
    // does it write no dash, and quotes the number.
    static std::string reason(std::string_view what) {
        const std::size_t dash = what.find(" - ");
        if (dash == what.npos) return "number out of range";
        what.remove_prefix(dash + 3);
        return std::string(what.substr(0, what.find(';')));
    }

    ValueBuilder builder_;
    std::string complaint_;
};

Error invalidAt(std::size_t byte, const std::string& reason) {
    return {platform::error_domain::json, EBADMSG, "invalid JSON at byte " + std::to_string(byte) + ": " + reason};
}

// How the two kinds of JSON text differ.
struct Style {
    bool strict;  // fails for what JSON does not have; the other kind puts something in its place
    JsonLayout layout;
};

class JsonWriter {
public:
    explicit JsonWriter(Style style) : style_(style) {}

    // False in strict style when the value cannot be written.
    bool write(const Value& value, int depth = 0) {
        switch (value.type()) {
            case Value::Type::Null: text_ += "null"; return true;
            case Value::Type::Bool: text_ += *value.asBool() ? "true" : "false"; return true;
            case Value::Type::Integer: appendNumber(*value.asInteger()); return true;
            case Value::Type::Double: return writeDouble(*value.asNumber());
            case Value::Type::String: return writeString(*value.asString());
            case Value::Type::Date: return writeDate(*value.asDate());
            case Value::Type::Data:
                if (style_.strict) return fail("data");
                return writeString(base64FromData(*value.asData()));
            case Value::Type::Array:
                return writeList('[', ']', *value.asArray(), depth,
                                 [&](const Value& element) { return write(element, depth + 1); });
            case Value::Type::Dictionary:
                return writeList('{', '}', *value.asDictionary(), depth, [&](const auto& entry) {
                    if (!writeString(entry.first)) return false;
                    text_ += style_.layout == JsonLayout::Indented ? ": " : ":";
                    return write(entry.second, depth + 1);
                });
        }
        return false;
    }

    std::string takeText() { return std::move(text_); }
    Error failure() const { return {platform::error_domain::json, EINVAL, "JSON cannot hold " + unwritable_}; }

private:
    template <class List, class WriteItem>
    bool writeList(char opening, char closing, const List& list, int depth, WriteItem writeItem) {
        text_ += opening;
        bool first = true;
        for (const auto& item : list) {
            if (!first) text_ += ',';
            first = false;
            breakLine(depth + 1);
            if (!writeItem(item)) return false;
        }
        if (!first) breakLine(depth);
        text_ += closing;
        return true;
    }

    void breakLine(int depth) {
        if (style_.layout == JsonLayout::Indented) text_.append("\n").append(2 * static_cast<std::size_t>(depth), ' ');
    }

    template <class Number>
    void appendNumber(Number number) {
        char digits[32];
        text_.append(digits, std::to_chars(digits, digits + sizeof digits, number).ptr);
    }

    bool writeDouble(double number) {
        if (std::isfinite(number))
            appendNumber(number);
        else if (style_.strict)
            return fail("a number that is not finite");
        else
            text_ += "null";
        return true;
    }

    bool writeDate(platform::Date date) {
        if (style_.strict) return fail("a date");
        return writeString(isoTextFromDate(date).value_or(platform::describe(date)));
    }

    bool writeString(std::string_view rest) {
        text_ += '"';
        while (!rest.empty()) {
            const std::string_view before = rest;
            // Character by character, so that the text is checked and escaped in one pass; a lax writer replaces each
            // wrong byte.
            std::optional<char32_t> character = takeCharacter(rest);
            if (!character) {
                if (style_.strict) return fail("text that is not UTF-8");
                appendUtf8(text_, U'\uFFFD');
                rest.remove_prefix(1);
            } else if (*character < 0x20 || *character == '"' || *character == '\\') {
                escape(static_cast<char>(*character));
            } else {
                text_ += before.substr(0, before.size() - rest.size());
            }
        }
        text_ += '"';
        return true;
    }

    void escape(char c) {
        constexpr std::string_view special = "\"\\\b\f\n\r\t", names = "\"\\bfnrt";
        constexpr char digits[] = "0123456789abcdef";
        text_ += '\\';
        if (const std::size_t at = special.find(c); at != special.npos)
            text_ += names[at];
        else
            text_.append("u00").append({digits[c >> 4], digits[c & 15]});
    }

    bool fail(const char* what) {
        unwritable_ = what;
        return false;
    }

    const Style style_;
    std::string text_;
    std::string unwritable_;
};

}  // namespace

Result<Value> parseJson(std::string_view document) {
    if (document.size() > platform::limits::documentBytes)
        return invalidAt(platform::limits::documentBytes, "document too large");
    // The library takes a NUL for the end of the document and would ignore what follows.
    if (const std::size_t nul = document.find('\0'); nul != document.npos) return invalidAt(nul, "NUL");

    // Releases of the library complain of an empty document in different ways.
    if (document.empty()) return invalidAt(0, "unexpected end of input");

    const char* begin = document.data();
    const char* readTo = begin;
    JsonReader reader;
    if (!nlohmann::json::sax_parse(TracedByte(begin, &readTo), TracedByte(begin + document.size(), &readTo), &reader))
        return invalidAt(static_cast<std::size_t>(readTo - begin), reader.complaint());
    return reader.takeRoot();
}

Result<std::string> serializeJson(const Value& root) {
    JsonWriter writer({.strict = true, .layout = JsonLayout::OneLine});
    if (!writer.write(root)) return writer.failure();
    return writer.takeText();
}

std::string printedJson(const Value& root, JsonLayout layout) {
    JsonWriter writer({.strict = false, .layout = layout});
    writer.write(root);
    return writer.takeText();
}

}  // namespace vrx::codec
