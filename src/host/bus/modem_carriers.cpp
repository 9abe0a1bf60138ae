#include "vrx/host/bus/modem_carriers.h"

#include <algorithm>
#include <utility>

namespace vrx::host {

using platform::Duration;

namespace {

constexpr const char* modemManager = "org.freedesktop.ModemManager1";
constexpr const char* modemManagerPath = "/org/freedesktop/ModemManager1";
constexpr const char* modemInterface = "org.freedesktop.ModemManager1.Modem";
constexpr const char* simInterface = "org.freedesktop.ModemManager1.Sim";
constexpr const char* objectManager = "org.freedesktop.DBus.ObjectManager";
constexpr const char* noSim = "/";
constexpr std::size_t mostModems = 8;

const std::vector<BusProperty>& modemProperties() {
    static const std::vector<BusProperty> properties = {{"Sim", "o"}, {"SimSlots", "ao"}, {"Device", "s"}};
    return properties;
}

const std::vector<BusProperty>& simProperties() {
    static const std::vector<BusProperty> properties = {{"OperatorIdentifier", "s"}};
    return properties;
}

// The time awake: a modem that leaves when the machine falls asleep has its time to come back after that.
Duration awakeTime() {
    return std::chrono::steady_clock::now().time_since_epoch();
}

// The country's code has three digits, the network's two or three, and a zero in front counts.
std::optional<platform::Carrier> carrierOf(const std::string& identifier) {
    constexpr std::size_t countryDigits = 3;
    const bool isNumber = std::ranges::all_of(identifier, [](char c) { return c >= '0' && c <= '9'; });
    if (!isNumber || identifier.size() < countryDigits + 2 || identifier.size() > countryDigits + 3)
        return std::nullopt;
    return platform::Carrier{.mobileCountryCode = identifier.substr(0, countryDigits),
                             .mobileNetworkCode = identifier.substr(countryDigits)};
}

}  // namespace

ModemCarriers::ModemCarriers(SystemBus& bus, Carriers kept, std::function<void()> onChange, ModemTimes times)
    : BusService(bus, modemManager), onChange_(std::move(onChange)), times_(times), carriers_(std::move(kept)) {
    for (const auto& [service, carrier] : carriers_) held_[service] = {.carrier = carrier};
}

ModemCarriers::Carriers ModemCarriers::carriers() const {
    const std::lock_guard lock(mutex_);
    return carriers_;
}

// Not the modem's changes of properties, of which each change of the signal's strength is one. With a change of its
// SIMs its state changes too.
void ModemCarriers::follow() {
    const std::string root = modemManagerPath;
    const auto askAgain = [this](sd_bus_message*) { askAgainLater(times_.pause); };
    match("path='" + root + "',interface='" + objectManager + "'", askAgain);
    match("path_namespace='" + root + "/Modem',interface='" + modemInterface + "',member='StateChanged'", askAgain);
    match(changedPropertiesRule("path_namespace='" + root + "/SIM'", simInterface),
          [this](sd_bus_message* signal) { takeSim(signal); });
}

void ModemCarriers::ask() {
    call(modemManagerPath, objectManager, "GetManagedObjects", [this](sd_bus_message* reply) { take(reply); });
}

void ModemCarriers::left() {
    hold_.reset();
    modems_.clear();
    operators_.clear();
    toBeAsked_.clear();
    for (auto& [service, held] : held_) held.until.reset();
}

void ModemCarriers::take(sd_bus_message* reply) {
    answered();
    auto modems = readModems(reply);
    if (!modems) return;
    modems_ = std::move(*modems);
    notePlaces();
    std::map<SimPath, std::string> operators;
    for (const Modem& modem : modems_)
        for (const SimPath& sim : modem.slots)
            if (sim != noSim) operators[sim] = operators_[sim];
    operators_ = std::move(operators);
    for (const auto& [sim, identifier] : operators_)
        if (identifier.empty() || toBeAsked_.contains(sim)) askOperator(sim);
    toBeAsked_.clear();
    update();
}

std::optional<std::vector<ModemCarriers::Modem>> ModemCarriers::readModems(sd_bus_message* reply) {
    std::vector<Modem> modems;
    const auto readObject = [&](std::string_view path) {
        return readBusDictionary(reply, "sa{sv}", [&](std::string_view interface) {
            if (interface != modemInterface) return sd_bus_message_skip(reply, "a{sv}") >= 0;
            BusValues values;
            if (!readBusProperties(reply, modemProperties(), values)) return false;
            modems.push_back(makeModem(std::string(path), values));
            return modems.size() <= mostModems;
        });
    };
    if (!reply || sd_bus_message_has_signature(reply, "a{oa{sa{sv}}}") <= 0 ||
        !readBusDictionary(reply, "oa{sa{sv}}", readObject))
        return std::nullopt;
    // The paths end in numbers.
    std::ranges::sort(modems, {}, [](const Modem& modem) { return std::pair(modem.path.size(), modem.path); });
    return modems;
}

// Which SIMs it has in which slots, and which one it uses: of a modem with one slot only the latter is told.
ModemCarriers::Modem ModemCarriers::makeModem(std::string path, const BusValues& values) {
    const auto value = [&values](const char* name) {
        const auto found = values.find(name);
        return found == values.end() ? platform::Value() : found->second;
    };
    const auto textOr = [](const platform::Value& text, const std::string& fallback) {
        return text.asString() ? *text.asString() : fallback;
    };
    Modem modem{.path = path, .device = textOr(value("Device"), path), .slots = {}};
    const platform::Value slots = value("SimSlots");
    if (const platform::Array* sims = slots.asArray())
        for (const platform::Value& sim : *sims) modem.slots.push_back(textOr(sim, noSim));
    if (const std::string sim = textOr(value("Sim"), noSim); modem.slots.empty() || sim != noSim)
        if (std::ranges::find(modem.slots, sim) == modem.slots.end()) modem.slots.push_back(sim);
    return modem;
}

// A modem that is new takes the next place; in the end that of one that has gone.
void ModemCarriers::notePlaces() {
    for (const Modem& modem : modems_) {
        auto place = std::ranges::find(places_, modem.device, &Place::device);
        if (place == places_.end()) {
            if (places_.size() == mostModems)
                places_.erase(std::ranges::find_if(places_, [this](const Place& one) {
                    return std::ranges::find(modems_, one.device, &Modem::device) == modems_.end();
                }));
            place = places_.insert(places_.end(), {modem.device, 0});
        }
        place->slots = std::max(place->slots, modem.slots.size());
    }
}

void ModemCarriers::askOperator(const SimPath& sim) {
    call(sim, propertiesInterface, "GetAll",
         [this, sim](sd_bus_message* reply) {
             BusValues values;
             if (readAllProperties(reply, simProperties(), values)) takeOperator(sim, values);
         },
         {simInterface});
}

void ModemCarriers::takeOperator(const SimPath& sim, const BusValues& values) {
    const auto known = operators_.find(sim);
    const auto value = values.find("OperatorIdentifier");
    if (known == operators_.end() || value == values.end() || !value->second.asString()) return;
    known->second = *value->second.asString();
    update();
}

void ModemCarriers::takeSim(sd_bus_message* signal) {
    const SimPath sim = sd_bus_message_get_path(signal);
    BusValues values;
    std::vector<std::string> toBeAsked;
    if (!readChangedProperties(signal, simInterface, simProperties(), values, toBeAsked)) return;
    takeOperator(sim, values);
    if (toBeAsked.empty() || !operators_.contains(sim)) return;
    toBeAsked_.insert(sim);
    askAgainLater(times_.pause);
}

ModemCarriers::Carriers ModemCarriers::toldCarriers() const {
    Carriers carriers;
    for (const Modem& modem : modems_) {
        std::size_t slot = 1;
        for (auto place = places_.begin(); place->device != modem.device; ++place) slot += place->slots;
        for (const SimPath& sim : modem.slots) {
            const auto identifier = operators_.find(sim);
            const auto carrier = identifier == operators_.end() ? std::nullopt : carrierOf(identifier->second);
            if (carrier) carriers["slot " + std::to_string(slot)] = *carrier;
            ++slot;
        }
    }
    return carriers;
}

// Takes over what is told now, and forgets what has not been told for its time.
void ModemCarriers::update() {
    const Carriers told = toldCarriers();
    const Duration now = awakeTime();
    std::optional<Duration> next;
    for (const auto& [service, carrier] : told) held_[service] = {.carrier = carrier};
    for (auto one = held_.begin(); one != held_.end();) {
        auto& [service, held] = *one;
        if (!told.contains(service) && !held.until) held.until = now + times_.hold;
        const bool isOver = held.until && *held.until <= now;
        if (held.until && !isOver) next = std::min(next.value_or(*held.until), *held.until);
        one = isOver ? held_.erase(one) : std::next(one);
    }
    hold_.reset();
    if (next)
        callAfter(
            hold_, *next - now, [this] { update(); }, CLOCK_MONOTONIC);
    publish();
}

void ModemCarriers::publish() {
    Carriers carriers;
    for (const auto& [service, held] : held_) carriers[service] = held.carrier;
    {
        const std::lock_guard lock(mutex_);
        if (carriers == carriers_) return;
        carriers_ = std::move(carriers);
    }
    onChange_();
}

}  // namespace vrx::host
