#include "vrx/host/bus/bluez_objects.h"

#include <algorithm>

namespace vrx::host {

namespace {

constexpr std::size_t mostBluezObjects = 64, bluezPathBytes = 256;

// Of all interfaces; no two of them mean different things by one name.
const std::vector<BusProperty>& bluezProperties() {
    static const std::vector<BusProperty> properties = {
        {"Address", "s"},          {"Discovering", "b"}, {"Paired", "b"}, {"Class", "u"},
        {"Appearance", "q"},       {"Alias", "s"},       {"Name", "s"},   {"Connected", "b"},
        {"ServicesResolved", "b"}, {"UUID", "s"}};
    return properties;
}

const platform::Value& valueOf(const BusValues& values, std::string_view name) {
    static const platform::Value none;
    const auto found = values.find(name);
    return found == values.end() ? none : found->second;
}

// Null when it is empty as well.
std::optional<std::string> textOf(const BusValues& values, std::string_view name) {
    const std::string* text = valueOf(values, name).asString();
    return text && !text->empty() ? std::optional(*text) : std::nullopt;
}

bool isTrue(const BusValues& values, std::string_view name) {
    return valueOf(values, name).asBool() == true;
}

bool isWatchKind(const BusValues& values) {
    constexpr std::int64_t watchCategory = 3, categoryShift = 6;        // of the appearance
    constexpr std::int64_t classMask = 0x1ffc, wearableWatch = 0x0704;  // major and minor class
    const auto appearance = valueOf(values, "Appearance").asInteger(), kind = valueOf(values, "Class").asInteger();
    return (appearance && *appearance >> categoryShift == watchCategory) ||
           (kind && (*kind & classMask) == wearableWatch);
}

std::optional<BluezFact> factOf(const BusValues& values) {
    const auto uuid = textOf(values, "UUID");
    if (uuid == "00002a24-0000-1000-8000-00805f9b34fb") return BluezFact::ModelNumber;
    if (uuid == "00002a25-0000-1000-8000-00805f9b34fb") return BluezFact::SerialNumber;
    return std::nullopt;
}

// Without its address, a device that is there would look like one that has gone; then nothing can be told from the
// rest.
bool addDevice(const std::string& path, const BusValues& values, const IsKnownAddress& isKnown, BluezObjects& objects) {
    BluezDevice device(values);
    if (device.address.empty()) return false;
    if (device.matters() || isKnown(device.address)) objects.devices.emplace(path, std::move(device));
    return objects.devices.size() <= mostBluezObjects;
}

bool addInterface(const std::string& path, const std::string& interface, const BusValues& values,
                  const IsKnownAddress& isKnown, BluezObjects& objects) {
    if (interface == "org.bluez.Device1") return addDevice(path, values, isKnown, objects);
    if (interface == "org.bluez.Adapter1") {
        if (const auto address = textOf(values, "Address"))
            objects.adapters[path] = {.address = *address, .isDiscovering = isTrue(values, "Discovering")};
    } else if (const auto fact = factOf(values)) {
        objects.characteristics[path] = *fact;
    }
    constexpr std::size_t factsOfDevice = 2;
    return objects.adapters.size() <= mostBluezObjects &&
           objects.characteristics.size() <= factsOfDevice * mostBluezObjects;
}

}  // namespace

BluezDevice::BluezDevice(const BusValues& values)
    : address(textOf(values, "Address").value_or("")),
      name(textOf(values, "Alias")),
      isPaired(valueOf(values, "Paired").asBool()),
      isWatch(isWatchKind(values)),
      isReadable(isTrue(values, "Connected") && isTrue(values, "ServicesResolved")) {
    if (!name) name = textOf(values, "Name");
}

bool BluezObjects::isDiscovering() const {
    return std::ranges::any_of(adapters, [](const auto& one) { return one.second.isDiscovering; });
}

bool readBluezObject(sd_bus_message* message, const std::string& path, const IsKnownAddress& isKnown,
                     BluezObjects& objects) {
    return readBusDictionary(message, "sa{sv}", [&](const std::string& interface) {
        objects.hasServices |= interface == "org.bluez.GattService1";
        const bool isWanted =
            path.size() <= bluezPathBytes && (interface == "org.bluez.Adapter1" || interface == "org.bluez.Device1" ||
                                              interface == "org.bluez.GattCharacteristic1");
        if (!isWanted) return sd_bus_message_skip(message, "a{sv}") >= 0;
        BusValues values;
        return readBusProperties(message, bluezProperties(), values) &&
               addInterface(path, interface, values, isKnown, objects);
    });
}

bool readBluezObjects(sd_bus_message* message, const IsKnownAddress& isKnown, BluezObjects& objects) {
    return sd_bus_message_has_signature(message, "a{oa{sa{sv}}}") > 0 &&
           readBusDictionary(message, "oa{sa{sv}}",
                             [&](const std::string& path) { return readBluezObject(message, path, isKnown, objects); });
}

BusValues readBluezChanges(sd_bus_message* signal, const char* interface, const std::vector<BusProperty>& wanted) {
    BusValues values;
    std::vector<std::string> toBeAsked;
    if (!readChangedProperties(signal, interface, wanted, values, toBeAsked)) return {};
    for (const std::string& name : toBeAsked) values[name] = platform::Value();
    return values;
}

}  // namespace vrx::host
