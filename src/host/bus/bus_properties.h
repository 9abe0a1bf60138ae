// Some properties of one object of a service, followed. Main thread, but for the values, which any thread may read.
#pragma once

#include <functional>
#include <map>
#include <mutex>
#include <string>
#include <vector>

#include "vrx/host/bus/bus_service.h"
#include "vrx/platform/value.h"

namespace vrx::host {

// A property that is wanted, and its type: "b", "q", "u", "s", "o", "as" or "ao". One of another type reads as absent.
struct BusProperty {
    const char* name;
    const char* type;
};

using BusValues = std::map<std::string, platform::Value, std::less<>>;

// Reads a dictionary of properties, "a{sv}", at the message's present place, and keeps the wanted ones. False when it
// is broken, or an array has more than 16 elements: then nothing of the message counts. Texts of more than 256 bytes
// read as absent.
bool readBusProperties(sd_bus_message* message, const std::vector<BusProperty>& wanted, BusValues& values);
// The same for the answer to GetAll, which is null if there is none.
bool readAllProperties(sd_bus_message* reply, const std::vector<BusProperty>& wanted, BusValues& values);
// The same for the signal of changes in that interface. Of the values so far only those in the signal change; one of a
// wrong type is removed. Then the names of what has changed too, but is to be asked for: of those that are wanted.
bool readChangedProperties(sd_bus_message* signal, std::string_view interface, const std::vector<BusProperty>& wanted,
                           BusValues& values, std::vector<std::string>& toBeAsked);

inline constexpr const char* propertiesInterface = "org.freedesktop.DBus.Properties";
// The rule for that signal. The place is a rule's path or path_namespace.
std::string changedPropertiesRule(const std::string& place, const std::string& interface);

// Calls with each key of a dictionary at the message's present place, to read or skip its value. The entry is its type,
// such as "sv". False when the dictionary is broken or the value was not taken.
template <class ReadValue>
bool readBusDictionary(sd_bus_message* message, const std::string& entry, ReadValue readValue) {
    int r = sd_bus_message_enter_container(message, 'a', ("{" + entry + "}").c_str());
    if (r <= 0) return false;
    while ((r = sd_bus_message_enter_container(message, 'e', entry.c_str())) > 0) {
        const char* key = nullptr;
        if (sd_bus_message_read_basic(message, entry.front(), &key) <= 0 || !readValue(std::string(key)) ||
            sd_bus_message_exit_container(message) < 0)
            return false;
    }
    return r == 0 && sd_bus_message_exit_container(message) >= 0;
}

class BusProperties final : public BusService {
public:
    struct Place {
        std::string service;
        std::string path;
        std::string interface;
    };
    // Calls onChange when a value has changed, come or gone.
    BusProperties(SystemBus& bus, Place place, std::vector<BusProperty> wanted, std::function<void()> onChange);

    // Null while the service does not tell it.
    platform::Value value(std::string_view name) const;
    // Whether the service has answered, or is known not to be there. Main thread.
    bool isSettled() const { return isSettled_; }

private:
    void follow() override;
    void ask() override;
    void left() override;
    void take(sd_bus_message* signal);
    void set(BusValues values);

    const Place place_;
    const std::vector<BusProperty> wanted_;
    const std::function<void()> onChange_;
    bool isSettled_ = false;
    mutable std::mutex mutex_;
    BusValues values_;
};

}  // namespace vrx::host
