#include "vrx/client/property_reader.h"

#include <cerrno>
#include <string_view>

namespace vrx::client {

using platform::Array;
using platform::Dictionary;
using platform::Error;
using platform::Value;

namespace {

// Of a variant: a text, a double, or a list of dictionaries of these. Returns a negative errno when the message ends
// before it should.
int readVariant(sd_bus_message* message, Value& value);

int readEntries(sd_bus_message* message, Dictionary& entries) {
    int r = sd_bus_message_enter_container(message, 'a', "{sv}");
    while (r > 0 && (r = sd_bus_message_enter_container(message, 'e', "sv")) > 0) {
        const char* key = "";
        Value value;
        r = sd_bus_message_read_basic(message, 's', &key);
        const std::string name = key;
        if (r > 0) r = readVariant(message, value);
        if (r >= 0 && !value.isNull()) entries.insert_or_assign(name, std::move(value));
        if (r >= 0) r = sd_bus_message_exit_container(message);
    }
    return r < 0 ? r : sd_bus_message_exit_container(message);
}

int readList(sd_bus_message* message, Array& list) {
    int r = sd_bus_message_enter_container(message, 'a', "a{sv}");
    while (r > 0 && (r = sd_bus_message_at_end(message, 0)) == 0) {
        Dictionary entries;
        r = readEntries(message, entries);
        list.emplace_back(std::move(entries));
    }
    return r < 0 ? r : sd_bus_message_exit_container(message);
}

int readVariant(sd_bus_message* message, Value& value) {
    char type = 0;
    const char* contents = "";
    int r = sd_bus_message_peek_type(message, &type, &contents);
    if (r <= 0 || type != 'v') return r < 0 ? r : -EBADMSG;
    const std::string_view signature(contents);
    if (signature != "s" && signature != "d" && signature != "aa{sv}") return sd_bus_message_skip(message, "v");
    r = sd_bus_message_enter_container(message, 'v', contents);
    if (r >= 0 && signature == "s") {
        const char* text = "";
        r = sd_bus_message_read_basic(message, 's', &text);
        if (r > 0) value = std::string(text);
    } else if (r >= 0 && signature == "d") {
        double number = 0;
        r = sd_bus_message_read_basic(message, 'd', &number);
        if (r > 0) value = number;
    } else if (r >= 0) {
        Array list;
        r = readList(message, list);
        value = std::move(list);
    }
    return r < 0 ? r : sd_bus_message_exit_container(message);
}

}  // namespace

platform::Result<Value> readProperties(sd_bus_message* reply) {
    Dictionary properties;
    if (readEntries(reply, properties) < 0)
        return Error{platform::error_domain::wire, EBADMSG, "the reply holds no properties"};
    return Value(std::move(properties));
}

}  // namespace vrx::client
