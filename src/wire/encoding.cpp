#include "vrx/wire/encoding.h"

#include <cerrno>
#include <cstring>
#include <optional>
#include <string>
#include <utility>

#include "vrx/codec/core/unicode.h"

namespace vrx::wire {

using platform::Array;
using platform::Data;
using platform::Date;
using platform::Dictionary;
using platform::Error;
using platform::Result;
using platform::Value;

namespace {

constexpr const char* rootKey = "root";
constexpr std::string_view escapedKeyPrefix = "$x";
constexpr const char* dateTag = "$date";
constexpr const char* stringTag = "$string";

// Values in a reply. A list holds a document for each device.
constexpr std::size_t replyValues = 10 * platform::limits::documentValues;

std::string escapedKey(std::string_view key) {
    constexpr char digits[] = "0123456789abcdef";
    std::string text(escapedKeyPrefix);
    for (char character : key) {
        auto byte = static_cast<unsigned char>(character);
        text += digits[byte >> 4];
        text += digits[byte & 15];
    }
    return text;
}

std::optional<unsigned> hexDigit(char digit) {
    if (digit >= '0' && digit <= '9') return static_cast<unsigned>(digit - '0');
    if (digit >= 'a' && digit <= 'f') return static_cast<unsigned>(digit - 'a' + 10);
    return std::nullopt;
}

// The key that was escaped; null when escapedKey() does not make such a text.
std::optional<std::string> unescapedKey(std::string_view escaped) {
    std::string_view digits = escaped.substr(escapedKeyPrefix.size());
    if (digits.size() % 2 != 0) return std::nullopt;
    std::string key;
    key.reserve(digits.size() / 2);
    for (std::size_t i = 0; i < digits.size(); i += 2) {
        auto high = hexDigit(digits[i]);
        auto low = hexDigit(digits[i + 1]);
        if (!high || !low) return std::nullopt;
        key += static_cast<char>(*high << 4 | *low);
    }
    if (isCarriedAsString(key)) return std::nullopt;  // each key has one form only
    return key;
}

constexpr bool isNoCharacter(char32_t codePoint) {
    return (codePoint >= 0xfdd0 && codePoint <= 0xfdef) || (codePoint & 0xfffe) == 0xfffe;
}

bool isLeftOut(const Value& value) {
    return value.isNull() || value.type() == Value::Type::Data;
}

// Appends values to a message. Each step returns a negative errno when it fails.
class Writer {
public:
    explicit Writer(sd_bus_message* message) : message_(message) {}

    // Appends an array of dictionary entries.
    template <class Entries>
    int dictionary(Entries appendEntries) {
        if (int r = sd_bus_message_open_container(message_, 'a', "{sv}"); r < 0) return r;
        if (int r = appendEntries(); r < 0) return r;
        return sd_bus_message_close_container(message_);
    }

    int entry(const char* key, const Value& value, int depthLeft) {
        if (int r = sd_bus_message_open_container(message_, 'e', "sv"); r < 0) return r;
        if (int r = sd_bus_message_append_basic(message_, 's', key); r < 0) return r;
        if (int r = variant(value, depthLeft); r < 0) return r;
        return sd_bus_message_close_container(message_);
    }

private:
    // Each value is a variant that names its own type, so that the reader needs no other description.
    int variant(const Value& value, int depthLeft) {
        switch (value.type()) {
            case Value::Type::Bool: {
                int flag = *value.asBool() ? 1 : 0;
                return scalar("b", &flag);
            }
            case Value::Type::Integer: {
                std::int64_t integer = *value.asInteger();
                return scalar("x", &integer);
            }
            case Value::Type::Double: {
                double number = *value.asNumber();
                return scalar("d", &number);
            }
            case Value::Type::String: {
                const std::string& text = *value.asString();
                if (isCarriedAsString(text)) return scalar("s", text.c_str());
                return tagged("(say)", stringTag,
                              [&] { return sd_bus_message_append_array(message_, 'y', text.data(), text.size()); });
            }
            case Value::Type::Date: {
                double seconds = value.asDate()->time_since_epoch().count();
                return tagged("(sd)", dateTag, [&] { return sd_bus_message_append_basic(message_, 'd', &seconds); });
            }
            case Value::Type::Array: return inside("av", [&] { return array(*value.asArray(), depthLeft - 1); });
            case Value::Type::Dictionary:
                return inside("a{sv}", [&] { return dictionary(*value.asDictionary(), depthLeft - 1); });
            case Value::Type::Null:
            case Value::Type::Data: break;
        }
        return -EINVAL;
    }

    template <class Append>
    int inside(const char* signature, Append append) {
        if (int r = sd_bus_message_open_container(message_, 'v', signature); r < 0) return r;
        if (int r = append(); r < 0) return r;
        return sd_bus_message_close_container(message_);
    }

    int scalar(const char* type, const void* value) {
        return inside(type, [&] { return sd_bus_message_append_basic(message_, type[0], value); });
    }

    // Appends a struct of the tag and the content.
    template <class Append>
    int tagged(const char* signature, const char* tag, Append append) {
        return inside(signature, [&] {
            const std::string members(signature + 1, std::strlen(signature) - 2);
            if (int r = sd_bus_message_open_container(message_, 'r', members.c_str()); r < 0) return r;
            if (int r = sd_bus_message_append_basic(message_, 's', tag); r < 0) return r;
            if (int r = append(); r < 0) return r;
            return sd_bus_message_close_container(message_);
        });
    }

    int array(const Array& array, int depthLeft) {
        if (depthLeft < 0) return -ELOOP;
        if (int r = sd_bus_message_open_container(message_, 'a', "v"); r < 0) return r;
        for (const Value& element : array) {
            if (isLeftOut(element)) continue;
            if (int r = variant(element, depthLeft); r < 0) return r;
        }
        return sd_bus_message_close_container(message_);
    }

    int dictionary(const Dictionary& entries, int depthLeft) {
        if (depthLeft < 0) return -ELOOP;
        return dictionary([&] {
            for (const auto& [key, value] : entries) {
                if (isLeftOut(value)) continue;
                int r = isCarriedAsString(key) ? entry(key.c_str(), value, depthLeft)
                                               : entry(escapedKey(key).c_str(), value, depthLeft);
                if (r < 0) return r;
            }
            return 0;
        });
    }

    sd_bus_message* const message_;
};

// Why a message is not a reply. It never leaves this file.
struct Malformed {
    const char* text;
};

// Reads values from a message, which sd-bus has checked to be well-formed when it arrived. Throws Malformed.
class Reader {
public:
    explicit Reader(sd_bus_message* message) : message_(message) {}

    Value reply() {
        Dictionary entries = dictionary(replyDepth + 1);
        if (sd_bus_message_at_end(message_, 1) <= 0) throw Malformed{"something follows the reply's dictionary"};
        Value root;
        if (auto entry = entries.find(rootKey); entry != entries.end()) {
            root = std::move(entry->second);
            entries.erase(entry);
        }
        if (!entries.empty()) throw Malformed{"the reply's dictionary holds more than its root"};
        return root;
    }

private:
    // Enters the next container; false when there is none left.
    bool enter(char type, const char* content) {
        int r = sd_bus_message_enter_container(message_, type, content);
        if (r < 0) throw Malformed{"a container is not of the type that belongs there"};
        return r > 0;
    }

    void exit() {
        if (sd_bus_message_exit_container(message_) < 0) throw Malformed{"a container holds more than belongs there"};
    }

    template <class T>
    T scalar(char type) {
        T value{};
        if (sd_bus_message_read_basic(message_, type, &value) <= 0) throw Malformed{"a value is missing"};
        return value;
    }

    void count() {
        if (++values_ > replyValues) throw Malformed{"the reply holds too many values"};
    }

    Value variant(int depthLeft) {
        count();
        char type = 0;
        const char* content = nullptr;
        if (sd_bus_message_peek_type(message_, &type, &content) <= 0 || type != 'v')
            throw Malformed{"a variant is missing"};
        const std::string_view signature = content;
        enter('v', content);
        Value value = valueOf(signature, depthLeft);
        exit();
        return value;
    }

    Value valueOf(std::string_view signature, int depthLeft) {
        if (signature == "s") return std::string_view(scalar<const char*>('s'));
        if (signature == "b") return scalar<int>('b') != 0;
        if (signature == "x") return scalar<std::int64_t>('x');
        if (signature == "d") return scalar<double>('d');
        if (signature == "a{sv}") return dictionary(depthLeft);
        if (signature == "av") return array(depthLeft);
        if (signature == "(sd)") return date();
        if (signature == "(say)") return uncarriedString();
        throw Malformed{"a value is of a type that the encoding does not have"};
    }

    Value date() {
        enterTagged("sd", dateTag);
        Value value = Date(platform::Duration(scalar<double>('d')));
        exit();
        return value;
    }

    Value uncarriedString() {
        enterTagged("say", stringTag);
        const void* bytes = nullptr;
        std::size_t size = 0;
        if (sd_bus_message_read_array(message_, 'y', &bytes, &size) < 0) throw Malformed{"a string has no bytes"};
        std::string text = size > 0 ? std::string(static_cast<const char*>(bytes), size) : std::string();
        if (isCarriedAsString(text)) throw Malformed{"a plain string is sent as bytes"};
        exit();
        return text;
    }

    void enterTagged(const char* members, std::string_view tag) {
        enter('r', members);
        if (scalar<const char*>('s') != tag) throw Malformed{"a tag is unknown"};
    }

    Array array(int depthLeft) {
        if (depthLeft <= 0) throw Malformed{"the reply is nested too deep"};
        Array elements;
        enter('a', "v");
        while (sd_bus_message_at_end(message_, 0) == 0) elements.push_back(variant(depthLeft - 1));
        exit();
        return elements;
    }

    Dictionary dictionary(int depthLeft) {
        if (depthLeft <= 0) throw Malformed{"the reply is nested too deep"};
        Dictionary entries;
        if (!enter('a', "{sv}")) throw Malformed{"the dictionary is missing"};
        while (enter('e', "sv")) {
            const char* name = scalar<const char*>('s');
            std::string key = unescaped(name);
            const std::size_t before = entries.size();
            Value value = variant(depthLeft - 1);
            // Keys usually come in order.
            entries.emplace_hint(entries.end(), std::move(key), std::move(value));
            if (entries.size() == before) throw Malformed{"a key stands twice in a dictionary"};
            exit();
        }
        exit();
        return entries;
    }

    static std::string unescaped(std::string_view name) {
        if (!name.starts_with(escapedKeyPrefix)) return std::string(name);
        std::optional<std::string> key = unescapedKey(name);
        if (!key) throw Malformed{"an escaped key is malformed"};
        return *key;
    }

    sd_bus_message* const message_;
    std::size_t values_ = 0;
};

}  // namespace

int appendReply(sd_bus_message* message, const Value& root) {
    Writer writer(message);
    return writer.dictionary([&] { return isLeftOut(root) ? 0 : writer.entry(rootKey, root, replyDepth); });
}

std::size_t encodedBytes(const Value& value) {
    constexpr std::size_t overhead = 16;  // of types, lengths and alignment
    std::size_t bytes = overhead;
    if (const std::string* text = value.asString()) bytes += text->size();
    if (const Array* array = value.asArray())
        for (const Value& element : *array) bytes += encodedBytes(element);
    if (const Dictionary* dictionary = value.asDictionary())
        for (const auto& [key, element] : *dictionary) bytes += overhead + key.size() + encodedBytes(element);
    return bytes;
}

Result<Value> readReply(sd_bus_message* message) {
    try {
        return Reader(message).reply();
    } catch (const Malformed& malformed) {
        return Error{platform::error_domain::wire, EBADMSG, malformed.text};
    }
}

bool isCarriedAsString(std::string_view bytes) {
    constexpr std::uint64_t ones = 0x0101010101010101u;
    constexpr std::uint64_t highs = 0x8080808080808080u;
    while (!bytes.empty()) {
        // Eight bytes at a time, as long as they are plain ASCII without NUL.
        if (bytes.size() >= 8) {
            std::uint64_t eight;
            std::memcpy(&eight, bytes.data(), 8);
            if (((eight | (eight - ones)) & highs) == 0) {
                bytes.remove_prefix(8);
                continue;
            }
        }
        const auto first = static_cast<unsigned char>(bytes.front());
        if (first > 0 && first < 0x80) {
            bytes.remove_prefix(1);
            continue;
        }
        const std::optional<char32_t> character = codec::takeCharacter(bytes);
        if (!character || *character == 0 || isNoCharacter(*character)) return false;
    }
    return true;
}

}  // namespace vrx::wire
