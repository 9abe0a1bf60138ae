#include "vrx/host/bus/modem_carriers.h"

#include "host/bus/mock_bus.h"

namespace vrx::host {
namespace {

constexpr const char* modemName = "org.freedesktop.ModemManager1";
constexpr const char* modemRoot = "/org/freedesktop/ModemManager1";
constexpr const char* modemMethod = "/org/freedesktop/ModemManager1 GetManagedObjects";
constexpr const char* simName = "org.freedesktop.ModemManager1.Sim";

std::string simPath(int number) {
    return std::string(modemRoot) + "/SIM/" + std::to_string(number);
}

class ModemCarriersTest : public BusTest {
protected:
    struct Modem {
        int number = 0;
        std::string device = "/usb/2";
        std::string sim = "/";
        std::vector<std::string> slots{};
    };

    static void add(MockObjects& objects, const Modem& modem) {
        MockInterfaces& interfaces = objects[std::string(modemRoot) + "/Modem/" + std::to_string(modem.number)];
        interfaces["org.freedesktop.ModemManager1.Modem.Time"];
        interfaces["org.freedesktop.ModemManager1.Modem"][""] = [modem](sd_bus_message* reply) {
            MockService::appendProperty(reply, "State", "i", 8);
            MockService::appendProperty(reply, "Device", "s", modem.device.c_str());
            MockService::appendProperty(reply, "Sim", modem.sim == "wrong" ? "s" : "o", modem.sim.c_str());
            sd_bus_message_open_container(reply, 'e', "sv");
            sd_bus_message_append(reply, "s", "SimSlots");
            sd_bus_message_open_container(reply, 'v', "ao");
            sd_bus_message_open_container(reply, 'a', "o");
            for (const std::string& slot : modem.slots) sd_bus_message_append(reply, "o", slot.c_str());
            for (int i = 0; i < 3; ++i) sd_bus_message_close_container(reply);
        };
    }
    // It has these from now on, and says so.
    static void have(MockService& manager, const std::vector<Modem>& modems) {
        MockObjects objects;
        for (const Modem& modem : modems) add(objects, modem);
        manager.methods[modemMethod] = [objects](sd_bus_message*, sd_bus_message* reply) {
            appendObjects(reply, objects);
            return std::nullopt;
        };
        manager.emitSignal(nullptr, modemRoot, "org.freedesktop.DBus.ObjectManager", "InterfacesRemoved",
                           [](sd_bus_message* signal) { sd_bus_message_append(signal, "oas", "/gone", 0); });
    }
    static void haveSim(MockService& manager, int number, const char* type, const char* identifier) {
        manager.answerProperties(simPath(number), [type, identifier](sd_bus_message* reply) {
            MockService::appendProperty(reply, "Imsi", "s", "");
            MockService::appendProperty(reply, "OperatorIdentifier", type, identifier);
        });
    }
    static std::string text(const ModemCarriers& carriers) {
        std::string text;
        for (const auto& [service, carrier] : carriers.carriers())
            text += service + ": " + *carrier.mobileCountryCode + "/" + *carrier.mobileNetworkCode + "; ";
        return text;
    }
    void runUntilCarriers(const ModemCarriers& carriers, const std::string& wanted) {
        runUntil([&] { return text(carriers) == wanted; }, wanted.c_str());
    }

    static constexpr platform::Duration moment{0.001}, forEver{86400};
    int changes = 0;
    ModemCarriers held{connection, {}, [] {}, {.hold = forEver, .pause = moment}};
    ModemCarriers carriers{
        connection, {{"slot 9", {"001", "01"}}}, [this] { ++changes; }, {.hold = moment, .pause = moment}};
};

TEST_F(ModemCarriersTest, AreThoseOfAllSlotsAndStayOverAProbe) {
    bus.start();
    connection.start();
    MockService manager(loop.event(), bus);
    haveSim(manager, 0, "s", "26201");
    haveSim(manager, 1, "s", "310260");
    haveSim(manager, 2, "s", "");
    const Modem first{.number = 2, .device = "/usb/1", .slots = {"/", simPath(0)}};
    const Modem second{.number = 10, .device = "/usb/2", .sim = simPath(1)};
    have(manager, {second, first});
    manager.takeName(modemName);
    const std::string both = "slot 2: 262/01; slot 3: 310/260; ";
    runUntilCarriers(carriers, both);
    runUntilCarriers(held, both);

    have(manager, {second});
    runUntilCarriers(carriers, "slot 3: 310/260; ");
    EXPECT_EQ(text(held), both);
    Modem again = first;
    again.number = 11;
    again.slots = {simPath(2), simPath(0)};
    have(manager, {second, again});
    runUntilCarriers(carriers, both);
    manager.emit(simPath(2), simName, "OperatorIdentifier", "s", "20404");  // it is unlocked
    runUntilCarriers(carriers, "slot 1: 204/04; " + both);
    manager.emit(simPath(2), simName, "OperatorIdentifier", "s", "20408");
    runUntilCarriers(held, "slot 1: 204/08; " + both);
    haveSim(manager, 2, "s", "20416");
    manager.invalidate(simPath(2), simName, "Imsi");
    manager.invalidate(simPath(2), simName, "OperatorIdentifier");
    runUntilCarriers(held, "slot 1: 204/16; " + both);

    haveSim(manager, 3, "s", "22801");
    again.slots = {simPath(3), simPath(0)};
    have(manager, {again});
    const std::string now = "slot 1: 228/01; slot 2: 262/01; ";
    runUntilCarriers(carriers, now);
    runUntilCarriers(held, now + "slot 3: 310/260; ");

    manager.leaveName(modemName);
    runUntil([&] { return !carriers.isThere() && !held.isThere(); }, "its going");
    EXPECT_EQ(text(carriers), now);
    bus.stop();
    runUntil([&] { return sd_bus_is_open(connection.connection()) <= 0; }, "the end of the bus");
    EXPECT_EQ(text(carriers), now);
}

TEST_F(ModemCarriersTest, BelieveNothingBroken) {
    bus.start();
    connection.start();
    MockService manager(loop.event(), bus);
    haveSim(manager, 0, "s", "26201");
    haveSim(manager, 1, "u", "1");
    const Modem modem{.number = 0, .device = "/usb/1", .sim = "wrong", .slots = {simPath(0), simPath(1)}};
    have(manager, {modem});
    manager.takeName(modemName);
    const std::string good = "slot 1: 262/01; ";
    runUntilCarriers(carriers, good);
    const int changesSoFar = changes;
    EXPECT_LE(changesSoFar, 2) << "of the modem and of its card, which may be told at once";

    manager.emit(simPath(0), simName, "OperatorIdentifier", "o", "/");
    manager.emit(simPath(0), simName, "OperatorIdentifier", "s", std::string(257, '1').c_str());
    manager.emit(simPath(0), "org.example.Other", "OperatorIdentifier", "s", "00101");
    manager.emit(simPath(7), simName, "OperatorIdentifier", "s", "00101");
    Modem large = modem;
    large.slots.resize(17, simPath(0));
    std::vector<Modem> tooMany(9);
    for (Modem& one : tooMany) one.number = static_cast<int>(&one - tooMany.data());
    have(manager, {large});
    const auto manySlots = manager.methods[modemMethod];
    have(manager, tooMany);
    const auto manyModems = manager.methods[modemMethod];
    for (const auto& method : {manySlots, manyModems, refusal("org.freedesktop.DBus.Error.AccessDenied"),
                               answer("i", 1), MockService::Method([](auto...) { return std::nullopt; })}) {
        manager.calls = 0;
        manager.methods[modemMethod] = method;
        runUntil(
            [&] {
                manager.emitSignal(nullptr, std::string(modemRoot) + "/Modem/0", "org.freedesktop.ModemManager1.Modem",
                                   "StateChanged",
                                   [](sd_bus_message* signal) { sd_bus_message_append(signal, "iiu", 8, 11, 1); });
                return manager.calls > 2;  // two ask
            },
            "the questions");
    }
    EXPECT_EQ(text(carriers), good);
    EXPECT_EQ(changes, changesSoFar);

    have(manager, {modem});
    for (const char* identifier : {"2620", "2620x", "2620123", ""}) {
        manager.emit(simPath(0), simName, "OperatorIdentifier", "s", identifier);
        runUntilCarriers(carriers, "");
        manager.emit(simPath(0), simName, "OperatorIdentifier", "s", "26201");
        runUntilCarriers(carriers, good);
    }
    EXPECT_EQ(text(held), good);
}

}  // namespace
}  // namespace vrx::host
