#include "vrx/host/bus/bus_properties.h"

#include <algorithm>
#include <cstring>

namespace vrx::host {

using platform::Value;

namespace {

constexpr std::size_t textBytes = 256, mostElements = 16;

// Reads one value of that type, or none.
Value readBasic(sd_bus_message* message, char type) {
    const char* text = "";
    std::uint32_t number = 0;
    std::uint16_t shortNumber = 0;
    int flag = 0;
    switch (type) {
        case 'b': return sd_bus_message_read_basic(message, type, &flag) > 0 ? Value(flag != 0) : Value();
        case 'u': return sd_bus_message_read_basic(message, type, &number) > 0 ? Value(std::int64_t{number}) : Value();
        case 'q':
            return sd_bus_message_read_basic(message, type, &shortNumber) > 0 ? Value(std::int64_t{shortNumber})
                                                                              : Value();
        default:
            if (sd_bus_message_read_basic(message, type, &text) <= 0 || std::strlen(text) > textBytes) return {};
            return Value(text);
    }
}

// An array that is too long is left in its midst, which breaks the message.
Value readTexts(sd_bus_message* message, const char* elements) {
    platform::Array texts;
    if (sd_bus_message_enter_container(message, 'a', elements) <= 0) return {};
    while (texts.size() < mostElements && sd_bus_message_at_end(message, 0) == 0)
        texts.push_back(readBasic(message, *elements));
    return sd_bus_message_exit_container(message) < 0 ? Value() : Value(std::move(texts));
}

}  // namespace

bool readBusProperties(sd_bus_message* message, const std::vector<BusProperty>& wanted, BusValues& values) {
    return readBusDictionary(message, "sv", [&](const std::string& name) {
        const char* contents = nullptr;
        char type = 0;
        if (sd_bus_message_peek_type(message, &type, &contents) <= 0 || type != 'v') return false;
        const auto property = std::ranges::find(wanted, name, &BusProperty::name);
        if (property == wanted.end() || std::strcmp(property->type, contents) != 0) {
            if (property != wanted.end()) values.erase(name);  // a bad value costs only itself
            return sd_bus_message_skip(message, "v") >= 0;
        }
        if (sd_bus_message_enter_container(message, 'v', contents) <= 0) return false;
        values[name] = *contents == 'a' ? readTexts(message, contents + 1) : readBasic(message, *contents);
        return sd_bus_message_exit_container(message) >= 0;
    });
}

bool readAllProperties(sd_bus_message* reply, const std::vector<BusProperty>& wanted, BusValues& values) {
    return reply && sd_bus_message_has_signature(reply, "a{sv}") > 0 && readBusProperties(reply, wanted, values);
}

bool readChangedProperties(sd_bus_message* signal, std::string_view interface, const std::vector<BusProperty>& wanted,
                           BusValues& values, std::vector<std::string>& toBeAsked) {
    const char* name = nullptr;
    if (sd_bus_message_has_signature(signal, "sa{sv}as") <= 0 || sd_bus_message_read_basic(signal, 's', &name) <= 0 ||
        interface != name || !readBusProperties(signal, wanted, values) ||
        sd_bus_message_enter_container(signal, 'a', "s") <= 0)
        return false;
    while (sd_bus_message_read_basic(signal, 's', &name) > 0)
        if (std::ranges::any_of(wanted, [&](const auto& one) { return std::strcmp(one.name, name) == 0; }))
            toBeAsked.emplace_back(name);
    return true;
}

std::string changedPropertiesRule(const std::string& place, const std::string& interface) {
    return place + ",interface='" + propertiesInterface + "',member='PropertiesChanged',arg0='" + interface + "'";
}

BusProperties::BusProperties(SystemBus& bus, Place place, std::vector<BusProperty> wanted,
                             std::function<void()> onChange)
    : BusService(bus, place.service),
      place_(std::move(place)),
      wanted_(std::move(wanted)),
      onChange_(std::move(onChange)) {}

Value BusProperties::value(std::string_view name) const {
    const std::lock_guard lock(mutex_);
    const auto found = values_.find(name);
    return found == values_.end() ? Value() : found->second;
}

void BusProperties::follow() {
    match(changedPropertiesRule("path='" + place_.path + "'", place_.interface),
          [this](sd_bus_message* signal) { take(signal); });
}

void BusProperties::ask() {
    call(place_.path, propertiesInterface, "GetAll",
         [this](sd_bus_message* reply) {
             answered();
             isSettled_ = true;
             BusValues values;
             if (readAllProperties(reply, wanted_, values)) set(std::move(values));
         },
         {place_.interface.c_str()});
}

void BusProperties::left() {
    isSettled_ = true;
    set({});
}

void BusProperties::take(sd_bus_message* signal) {
    BusValues values = values_;  // only this thread changes them
    std::vector<std::string> toBeAsked;
    if (!readChangedProperties(signal, place_.interface, wanted_, values, toBeAsked)) return;
    set(std::move(values));
    if (!toBeAsked.empty()) askAgainLater();
}

void BusProperties::set(BusValues values) {
    {
        const std::lock_guard lock(mutex_);
        if (values == values_) return;
        values_ = std::move(values);
    }
    onChange_();
}

}  // namespace vrx::host
