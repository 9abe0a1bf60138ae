// What BlueZ tells of its objects, read without trust: its adapters, the devices that matter here, and where the facts
// of a device can be read. Pure functions of a message.
#pragma once

#include <systemd/sd-bus.h>

#include <functional>
#include <map>
#include <optional>
#include <string>

#include "vrx/host/bus/bus_properties.h"

namespace vrx::host {

struct BluezAdapter {
    std::string address;
    bool isDiscovering = false;
};

struct BluezDevice {
    std::string address;
    std::optional<std::string> name;  // the user's for it, else its own
    std::optional<bool> isPaired;     // null while that is not told
    bool isWatch = false;             // by its class or appearance
    bool isReadable = false;          // connected, and its characteristics are known

    explicit BluezDevice(const BusValues& values);
    // Paired, or it could become a paired watch.
    bool matters() const { return isPaired == true || isWatch; }
};

// What a device tells of itself when it is asked over the air.
enum class BluezFact : std::uint8_t { ModelNumber, SerialNumber };

// All of them by their path.
struct BluezObjects {
    std::map<std::string, BluezAdapter> adapters;
    std::map<std::string, BluezDevice> devices;  // those that matter, or are known
    std::map<std::string, BluezFact> characteristics;
    bool hasServices = false;  // those of some device, which come when it connects

    bool isDiscovering() const;
};

// Whether there is a watch of that address already.
using IsKnownAddress = std::function<bool(const std::string&)>;

// Adds one object, whose interfaces, "a{sa{sv}}", are at the message's present place, or all objects of such a
// dictionary, "a{oa{sa{sv}}}". False when the message is broken, or there would be more than 64 devices: then nothing
// of it counts.
bool readBluezObject(sd_bus_message* message, const std::string& path, const IsKnownAddress& isKnown,
                     BluezObjects& objects);
bool readBluezObjects(sd_bus_message* message, const IsKnownAddress& isKnown, BluezObjects& objects);

// The properties in a PropertiesChanged of that interface; those to be asked for are null. Empty when it is broken.
BusValues readBluezChanges(sd_bus_message* signal, const char* interface, const std::vector<BusProperty>& wanted);

}  // namespace vrx::host
