#include <algorithm>
#include <charconv>
#include <optional>

#include "vrx/codec/base64.h"
#include "vrx/codec/expat.h"
#include "vrx/codec/iso_date.h"
#include "vrx/codec/line_text.h"
#include "vrx/codec/property_list_error.h"
#include "vrx/codec/value_builder.h"
#include "vrx/codec/xml_property_list.h"

namespace vrx::codec {

using platform::Data;
using platform::Result;
using platform::Value;

namespace {

// The whole text as a number in that form; null when it is not one or is out of range.
template <class Number, class... Form>
std::optional<Number> parsed(std::string_view text, Form... form) {
    Number number{};
    auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), number, form...);
    if (error != std::errc() || end != text.data() + text.size()) return std::nullopt;
    return number;
}

// Decimal, or hexadecimal after 0x, as some tools write flags.
std::optional<Value> integerValue(std::string_view text) {
    const bool negative = text.starts_with('-');
    if (negative || text.starts_with('+')) text.remove_prefix(1);
    const bool hexadecimal = text.starts_with("0x") || text.starts_with("0X");
    if (hexadecimal) text.remove_prefix(2);
    const auto magnitude = parsed<std::uint64_t>(text, hexadecimal ? 16 : 10);
    if (!magnitude) return std::nullopt;
    if (!negative) return Value(*magnitude);
    if (*magnitude > std::uint64_t{1} << 63) return std::nullopt;
    return Value(static_cast<std::int64_t>(0 - *magnitude));
}

// "nan", "inf" and "infinity" are numbers here.
std::optional<Value> realValue(std::string_view text) {
    if (text.starts_with('+')) {
        text.remove_prefix(1);
        if (text.starts_with('-')) return std::nullopt;
    }
    const auto number = parsed<double>(text);
    return number ? std::optional(Value(*number)) : std::nullopt;
}

template <class T>
std::optional<Value> valueOf(const std::optional<T>& content) {
    return content ? std::optional(Value(*content)) : std::nullopt;
}

// Reads a document by the events of expat. The first complaint ends the parse.
class XmlReader {
public:
    XmlReader() : parser_(expat().parserCreate(nullptr)) {
        expat().setUserData(parser_.get(), this);
        expat().setElementHandler(
            parser_.get(), [](void* self, const char* name, const char**) { of(self).begin(name); },
            [](void* self, const char* name) { of(self).end(name); });
        expat().setCharacterDataHandler(parser_.get(), [](void* self, const char* text, int length) {
            of(self).characters({text, static_cast<std::size_t>(length)});
        });
        // Entities can make a small document a huge one, or vanish from it unseen; property lists do not need them.
        expat().setEntityDeclHandler(
            parser_.get(), [](void* self, const char*, int, const char*, int, const char*, const char*, const char*,
                              const char*) { of(self).complain("entities are not supported"); });
        expat().setSkippedEntityHandler(
            parser_.get(), [](void* self, const char*, int) { of(self).complain("entities are not supported"); });
    }

    Result<Value> read(const Data& document) {
        const auto* bytes = reinterpret_cast<const char*>(document.data());
        const bool parsed =
            expat().parse(parser_.get(), bytes, static_cast<int>(document.size()), XML_TRUE) == XML_STATUS_OK;
        if (complaint_.empty()) {
            if (parsed) return builder_.takeRoot();
            complain(expat().errorString(expat().getErrorCode(parser_.get())));
        }
        return invalidPropertyList(place_, complaint_);
    }

private:
    static XmlReader& of(void* self) { return *static_cast<XmlReader*>(self); }

    void complain(const std::string& complaint) {
        if (!complaint_.empty()) return;
        complaint_ = complaint;
        place_ = "line " + std::to_string(expat().currentLine(parser_.get())) + ":" +
                 std::to_string(expat().currentColumn(parser_.get()) + 1);
        expat().stopParser(parser_.get(), XML_FALSE);
    }
    void requireLimit(bool within) {
        if (!within) complain(builder_.complaint());
    }

    // Order of the checks: place in the document, then kind of element. Expat may still report an event or two after
    // the parse was stopped.
    void begin(std::string_view name) {
        if (!complaint_.empty()) return;
        if (!leaf_.empty()) return complain("an element within <" + leaf_ + ">");
        if (!insidePlist_) {
            if (name != "plist") return complain("the root is not <plist>");
            insidePlist_ = true;
        } else if (name == "key") {
            if (!builder_.expectsKey()) return complain("a key out of place");
            leaf_ = name;
        } else if (!builder_.expectsValue()) {
            complain(builder_.expectsKey() ? "a value without a key" : "a second root value");
        } else if (name == "dict") {
            requireLimit(builder_.beginDictionary());
        } else if (name == "array") {
            requireLimit(builder_.beginArray());
        } else if (isLeaf(name)) {
            leaf_ = name;
        } else {
            complain("an unknown element");
        }
    }

    void end(std::string_view name) {
        if (!complaint_.empty()) return;
        if (!leaf_.empty()) {
            endLeaf();
        } else if (name == "plist") {
            if (!builder_.isComplete()) complain("no value");
        } else {
            if (!builder_.isInArray() && !builder_.expectsKey()) return complain("a key without a value");
            builder_.end();
        }
    }

    void characters(std::string_view text) {
        if (!complaint_.empty()) return;
        if (!leaf_.empty())
            text_ += text;
        else if (!trimmed(text).empty())
            complain("text outside of a value");
    }

    void endLeaf() {
        const std::string leaf = std::move(leaf_);
        std::string text = std::move(text_);
        leaf_.clear();
        text_.clear();
        if (leaf == "key") return builder_.key(std::move(text));
        std::optional<Value> value = leafValue(leaf, std::move(text));
        if (!value) return complain("not a valid " + leaf);
        requireLimit(builder_.add(*std::move(value)));
    }

    static bool isLeaf(std::string_view name) {
        constexpr std::string_view leaves[] = {"string", "integer", "real", "true", "false", "date", "data"};
        return std::ranges::find(leaves, name) != std::end(leaves);
    }

    static std::optional<Value> leafValue(std::string_view name, std::string text) {
        if (name == "string") return Value(std::move(text));
        if (name == "integer") return integerValue(trimmed(text));
        if (name == "real") return realValue(trimmed(text));
        if (name == "date") return valueOf(dateFromIsoText(trimmed(text)));
        if (name == "data") return valueOf(dataFromBase64(text));
        if (!trimmed(text).empty()) return std::nullopt;
        return Value(name == "true");
    }

    XmlParser parser_;
    ValueBuilder builder_;
    bool insidePlist_ = false;
    std::string leaf_;  // the element whose text is being read; empty between such elements
    std::string text_;
    std::string complaint_;
    std::string place_;
};

}  // namespace

Result<Value> parseXmlPropertyList(const Data& document) {
    if (const std::string missing = expat().library.missing(); !missing.empty())
        return invalidPropertyList("its beginning", missing);
    return XmlReader().read(document);
}

}  // namespace vrx::codec
