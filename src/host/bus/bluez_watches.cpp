#include "vrx/host/bus/bluez_watches.h"

#include <algorithm>
#include <tuple>
#include <utility>

#include "vrx/host/base/text.h"
#include "vrx/platform/utf8.h"

namespace vrx::host {

using platform::Duration;

namespace {

constexpr const char* adapterInterface = "org.bluez.Adapter1";
constexpr const char* deviceInterface = "org.bluez.Device1";
constexpr std::size_t mostWatches = 64, factBytes = 256;

// What of a device is worth a question when it changes.
const std::vector<BusProperty>& changesOfDevice() {
    static const std::vector<BusProperty> properties = {{"Address", "s"},         {"Paired", "b"}, {"Class", "u"},
                                                        {"Appearance", "q"},      {"Alias", "s"},  {"Name", "s"},
                                                        {"ServicesResolved", "b"}};
    return properties;
}

std::string parentPath(const std::string& path) {
    return path.substr(0, path.rfind('/'));
}

// Text as a device sends it, with whatever it fills it up with.
std::optional<std::string> readFact(sd_bus_message* reply) {
    const void* bytes = nullptr;
    std::size_t size = 0;
    if (!reply || sd_bus_message_has_signature(reply, "ay") <= 0 ||
        sd_bus_message_read_array(reply, 'y', &bytes, &size) <= 0)
        return std::nullopt;
    constexpr std::string_view filling(" \t\r\n\0", 5);
    std::string_view text(static_cast<const char*>(bytes), size);
    const std::size_t begin = text.find_first_not_of(filling);
    if (begin == text.npos) return std::nullopt;
    text = text.substr(begin, text.find_last_not_of(filling) + 1 - begin);
    if (text.size() > factBytes || !isOneLine(text) || !platform::isUtf8(text)) return std::nullopt;
    return std::string(text);
}

std::optional<std::string> KnownWatch::*memberOf(BluezFact fact) {
    return fact == BluezFact::SerialNumber ? &KnownWatch::serialNumber : &KnownWatch::model;
}

void sortByPairing(std::vector<KnownWatch>& watches) {
    std::ranges::sort(watches, {}, [](const KnownWatch& watch) { return std::tie(watch.pairingDate, watch.address); });
}

}  // namespace

BluezWatches::BluezWatches(SystemBus& bus, std::vector<KnownWatch> kept, std::function<platform::Date()> now,
                           std::function<void()> onChange, BluezPauses pauses)
    : BusService(bus, "org.bluez"),
      now_(std::move(now)),
      onChange_(std::move(onChange)),
      pauses_(pauses),
      watches_(std::move(kept)) {
    sortByPairing(watches_);
}

std::vector<KnownWatch> BluezWatches::watches() const {
    const std::lock_guard lock(mutex_);
    return watches_;
}

bool BluezWatches::isAnswered() const {
    const std::lock_guard lock(mutex_);
    return isAnswered_;
}

void BluezWatches::follow() {
    const std::string manager = "path='/',interface='org.freedesktop.DBus.ObjectManager',member=";
    match(manager + "'InterfacesAdded'", [this](sd_bus_message* signal) { takeAdded(signal); });
    match(manager + "'InterfacesRemoved'", [this](sd_bus_message* signal) { takeRemoved(signal); });
    match(changedPropertiesRule("path_namespace='/org/bluez'", adapterInterface),
          [this](sd_bus_message* signal) { takeAdapter(signal); });
    rules_.clear();
    followDevices();
}

// Whether that differs from before. A discovery tells of every advertisement of every device around, so meanwhile only
// the devices that matter are followed, one by one.
bool BluezWatches::followDevices() {
    std::vector<std::string> rules;
    if (!objects_.isDiscovering())
        rules.push_back(changedPropertiesRule("path_namespace='/org/bluez'", deviceInterface));
    else
        for (const auto& [path, device] : objects_.devices)
            rules.push_back(changedPropertiesRule("path='" + path + "'", deviceInterface));
    if (rules == rules_) return false;
    rules_ = std::move(rules);
    matchInstead(rules_, [this](sd_bus_message* signal) { takeDevice(signal); });
    return true;
}

void BluezWatches::ask() {
    forget();
    followDevices();
    sendQuestion();
}

void BluezWatches::left() {
    forget();
    noteAnswered();
}

void BluezWatches::noteAnswered() {
    {
        const std::lock_guard lock(mutex_);
        if (std::exchange(isAnswered_, true)) return;
    }
    onChange_();
}

// What an owner of the name has told does not count for the next; the watches stay.
void BluezWatches::forget() {
    objects_ = {};
    pause_.reset();
    suspects_.clear();
    read_.clear();
    isAsking_ = shouldAskAgain_ = isReading_ = false;
}

void BluezWatches::sendQuestion() {
    isAsking_ = true;
    askedAt_ = bootTime();
    call("/", "org.freedesktop.DBus.ObjectManager", "GetManagedObjects", [this](sd_bus_message* answer) {
        isAsking_ = false;
        if (std::exchange(shouldAskAgain_, false)) askLater(pauses_.betweenQuestions);
        // An error, or an answer that means nothing, is one as well: nobody need wait for a better one.
        if (!answer || !takeAnswer(answer)) noteAnswered();
    });
}

// However much is signalled, it is asked again only after a pause, and wakes the machine along with others.
void BluezWatches::askLater(Duration pause) {
    const Duration due = bootTime() + pause;
    if (pause_ && due_ <= due) return;
    due_ = due;
    callAfter(pause_, pause, [this] {
        if (isAsking_)
            shouldAskAgain_ = true;
        else
            sendQuestion();
    });
}

// False when it is broken.
bool BluezWatches::takeAnswer(sd_bus_message* answer) {
    BluezObjects objects;
    if (!readBluezObjects(
            answer, [this](const std::string& address) { return isKnown(address); }, objects))
        return false;
    objects_ = std::move(objects);
    // A device may have changed before it came to be followed.
    if (followDevices()) askLater(pauses_.betweenQuestions);
    std::erase_if(read_, [this](const std::string& path) { return !readableDevice(path); });

    std::set<std::string> present;
    for (const auto& [path, device] : objects_.devices)
        if (device.isPaired != false) present.insert(device.address);
    std::vector<KnownWatch> watches = watches_;
    std::erase_if(watches, [&](const KnownWatch& watch) { return isUnpaired(watch, present); });
    for (const auto& [path, device] : objects_.devices)
        if (device.isPaired == true) takePaired(path, device, watches);
    set(std::move(watches));
    readNext();
    return true;
}

void BluezWatches::takePaired(const std::string& path, const BluezDevice& device, std::vector<KnownWatch>& watches) {
    const auto adapter = objects_.adapters.find(parentPath(path));
    if (adapter == objects_.adapters.end()) return;
    auto watch = std::ranges::find(watches, device.address, &KnownWatch::address);
    if (watch == watches.end()) {
        if (!device.isWatch || watches.size() >= mostWatches) return;
        watch = watches.insert(watches.end(), {.address = device.address, .pairingDate = now_()});
    }
    watch->adapter = adapter->second.address;
    if (device.name) watch->name = *device.name;
}

bool BluezWatches::isUnpaired(const KnownWatch& watch, const std::set<std::string>& present) {
    const auto suspected = suspects_.find(watch.address);
    const bool isAdapterThere =
        std::ranges::any_of(objects_.adapters, [&](const auto& one) { return one.second.address == watch.adapter; });
    if (present.contains(watch.address) || !isAdapterThere) {
        if (suspected != suspects_.end()) suspects_.erase(suspected);
        return false;
    }
    if (suspected == suspects_.end() || askedAt_ < suspected->second + pauses_.beforeUnpaired) {
        suspect(watch.address);
        return false;
    }
    suspects_.erase(suspected);
    return true;
}

void BluezWatches::suspect(const std::string& address) {
    suspects_.try_emplace(address, bootTime());
    askLater(pauses_.beforeUnpaired);
}

void BluezWatches::takeAdapter(sd_bus_message* signal) {
    const BusValues changes = readBluezChanges(signal, adapterInterface, {{"Discovering", "b"}});
    if (changes.empty()) return;
    const auto isDiscovering = changes.begin()->second.asBool();
    const auto adapter = objects_.adapters.find(sd_bus_message_get_path(signal));
    const bool isStarting = isDiscovering == true && adapter != objects_.adapters.end();
    if (isDiscovering && adapter != objects_.adapters.end()) adapter->second.isDiscovering = *isDiscovering;
    followDevices();
    // While it ran, a device of which nothing was known may have been paired.
    if (!isStarting) askLater(pauses_.betweenQuestions);
}

void BluezWatches::takeDevice(sd_bus_message* signal) {
    const BusValues changes = readBluezChanges(signal, deviceInterface, changesOfDevice());
    const auto known = objects_.devices.find(sd_bus_message_get_path(signal));
    const BluezDevice changed(changes);
    if (known != objects_.devices.end() && changed.isPaired == false && isKnown(known->second.address))
        suspect(known->second.address);
    else if (changed.matters() || (known != objects_.devices.end() && !changes.empty()))
        askLater(pauses_.betweenQuestions);
}

void BluezWatches::takeAdded(sd_bus_message* signal) {
    const char* path = nullptr;
    BluezObjects added;
    if (sd_bus_message_has_signature(signal, "oa{sa{sv}}") <= 0 || sd_bus_message_read_basic(signal, 'o', &path) <= 0 ||
        !readBluezObject(
            signal, path, [this](const std::string& address) { return isKnown(address); }, added))
        return;
    if (!added.adapters.empty()) suspects_.clear();
    // A device that connects during a discovery may be one that is being paired.
    const bool isConnecting = added.hasServices && objects_.isDiscovering();
    if (!added.adapters.empty() || !added.devices.empty() || isConnecting) askLater(pauses_.betweenQuestions);
}

void BluezWatches::takeRemoved(sd_bus_message* signal) {
    const char* path = nullptr;
    if (sd_bus_message_has_signature(signal, "oas") <= 0 || sd_bus_message_read_basic(signal, 'o', &path) <= 0 ||
        sd_bus_message_enter_container(signal, 'a', "s") <= 0)
        return;
    const auto device = objects_.devices.find(path);
    const char* interface = nullptr;
    while (sd_bus_message_read_basic(signal, 's', &interface) > 0) {
        if (interface == std::string_view(adapterInterface)) {
            suspects_.clear();  // its devices went with it
            askLater(pauses_.betweenQuestions);
        } else if (interface == std::string_view(deviceInterface) && device != objects_.devices.end() &&
                   isKnown(device->second.address)) {
            suspect(device->second.address);
        }
    }
}

bool BluezWatches::isKnown(const std::string& address) const {
    return std::ranges::find(watches_, address, &KnownWatch::address) != watches_.end();
}

// Null while that cannot be asked for.
const BluezDevice* BluezWatches::readableDevice(const std::string& characteristic) const {
    const auto device = std::ranges::find_if(
        objects_.devices, [&](const auto& one) { return characteristic.starts_with(one.first + "/"); });
    return device != objects_.devices.end() && device->second.isReadable ? &device->second : nullptr;
}

// One after the other: each costs the watch's battery a little. What could not be read is tried again when the watch
// connects anew.
void BluezWatches::readNext() {
    if (isReading_) return;
    for (const auto& [path, fact] : objects_.characteristics) {
        const BluezDevice* device = readableDevice(path);
        if (!device) continue;
        const auto watch = std::ranges::find(watches_, device->address, &KnownWatch::address);
        if (watch == watches_.end() || (*watch).*memberOf(fact) || !read_.insert(path).second) continue;
        isReading_ = true;
        return call(
            path, "org.bluez.GattCharacteristic1", "ReadValue",
            [this, address = watch->address, fact = fact](sd_bus_message* reply) {
                isReading_ = false;
                takeFact(address, fact, reply);
                readNext();
            },
            [](sd_bus_message* message) { return sd_bus_message_append(message, "a{sv}", 0); });
    }
}

void BluezWatches::takeFact(const std::string& address, BluezFact fact, sd_bus_message* reply) {
    std::vector<KnownWatch> watches = watches_;
    const auto watch = std::ranges::find(watches, address, &KnownWatch::address);
    if (watch == watches.end()) return;
    if (auto text = readFact(reply)) (*watch).*memberOf(fact) = std::move(text);
    set(std::move(watches));
}

void BluezWatches::set(std::vector<KnownWatch> watches) {
    sortByPairing(watches);
    {
        const std::lock_guard lock(mutex_);
        if (std::exchange(isAnswered_, true) && watches == watches_) return;
        watches_ = std::move(watches);
    }
    onChange_();
}

}  // namespace vrx::host
