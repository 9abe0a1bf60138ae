#include "vrx/host/bus/bluez_watches.h"

#include "host/bus/mock_bus.h"

namespace vrx::host {
namespace {

using testing::ElementsAre;
using testing::IsEmpty;

const std::string adapterPath = "/org/bluez/hci0";
constexpr const char* adapter = "org.bluez.Adapter1";
constexpr const char* device = "org.bluez.Device1";
constexpr const char* characteristic = "org.bluez.GattCharacteristic1";
constexpr const char* manager = "org.freedesktop.DBus.ObjectManager";
constexpr const char* serialNumber = "00002a25-0000-1000-8000-00805f9b34fb";
constexpr const char* modelNumber = "00002a24-0000-1000-8000-00805f9b34fb";

class MockBluez : public MockService {
public:
    MockBluez(sd_event* loop, const MockBus& bus) : MockService(loop, bus) {
        methods["/ GetManagedObjects"] = [this](sd_bus_message*, sd_bus_message* reply) {
            ++questions;
            appendObjects(reply, objects);
            return std::nullopt;
        };
    }

    int questions = 0;
    MockObjects objects;

    template <class Type>
    void set(const std::string& path, const char* interface, const char* property, const char* type, Type value) {
        objects[path][interface][property] = [property, type, value](sd_bus_message* message) {
            if constexpr (std::is_same_v<Type, std::string>)
                appendProperty(message, property, type, value.c_str());
            else
                appendProperty(message, property, type, value);
        };
    }
    template <class Type>
    void change(const std::string& path, const char* interface, const char* property, const char* type, Type value) {
        set(path, interface, property, type, value);
        emit(path, interface, property, type, value);
    }

    void addAdapter(const std::string& path = adapterPath, const char* address = "AA") {
        set(path, adapter, "Address", "s", address);
        set(path, adapter, "Discovering", "b", 0);
    }
    // A device of which no more is known than that. Its address is its name.
    std::string addDevice(const std::string& name, bool isPaired, const std::string& above = adapterPath) {
        const std::string path = above + "/dev_" + name;
        set(path, device, "Address", "s", name);
        set(path, device, "Alias", "s", name);
        set(path, device, "Paired", "b", isPaired ? 1 : 0);
        return path;
    }
    std::string addWatch(const std::string& name, bool isPaired, const std::string& above = adapterPath) {
        const std::string path = addDevice(name, isPaired, above);
        set(path, device, "Appearance", "q", 0x00C1);
        return path;
    }
    // That the device says that when it is asked.
    void addFact(const std::string& path, const char* uuid, const std::string& bytes) {
        set(path, characteristic, "UUID", "s", uuid);
        methods[path + " ReadValue"] = [this, bytes](sd_bus_message* call, sd_bus_message* reply) {
            ++reads;
            EXPECT_GT(sd_bus_message_has_signature(call, "a{sv}"), 0);
            sd_bus_message_append_array(reply, 'y', bytes.data(), bytes.size());
            return std::nullopt;
        };
    }
    int reads = 0;

    void signalAdded(const std::string& path) {
        emitSignal(nullptr, "/", manager, "InterfacesAdded",
                   [&](sd_bus_message* signal) { appendObject(signal, path, objects[path]); });
    }
    void remove(const std::string& path) {
        const auto object = objects.extract(path);
        for (const auto& interface : object.mapped())
            emitSignal(nullptr, "/", manager, "InterfacesRemoved", [&](sd_bus_message* signal) {
                sd_bus_message_append(signal, "oas", path.c_str(), 1, interface.first.c_str());
            });
    }
};

class BluezWatchesTest : public BusTest {
protected:
    void start(std::vector<KnownWatch> kept = {}, platform::Duration beforeUnpaired = platform::Duration(1e-6)) {
        watches.emplace(
            connection, std::move(kept), [this] { return platform::dateFromEpoch(today); }, [this] { ++changes; },
            BluezPauses{.betweenQuestions = platform::Duration(1e-6), .beforeUnpaired = beforeUnpaired});
        bus.start();
        connection.start();
    }
    std::vector<std::string> names() {
        std::vector<std::string> names;
        for (const KnownWatch& watch : watches->watches()) names.push_back(watch.name);
        return names;
    }
    void runUntilNames(const std::vector<std::string>& wanted) {
        runUntil([&] { return names() == wanted; }, "the watches");
        EXPECT_EQ(names(), wanted);
    }
    // Until the mock's signals have been taken, and what they caused at once.
    void settle(MockBluez& bluez) {
        for (int i = 0; i < 5; ++i) {
            bluez.emit("/fence", "org.example.Fence", "Count", "u", ++fenceCount);
            runUntil([&] { return fence.value("Count") == platform::Value(fenceCount); }, "the fence");
        }
    }
    // Until so many more questions have been asked and answered, outside a discovery.
    void runQuestions(MockBluez& bluez, int count) {
        for (int i = 0; i < count; ++i) {
            const int before = bluez.questions;
            bluez.emit("/org/bluez/hci9/dev_any", device, "Paired", "b", 1);
            runUntil([&] { return bluez.questions > before; }, "a question");
        }
        settle(bluez);
    }
    static KnownWatch keptWatch(const std::string& name, double date, const std::string& adapterAddress = "AA") {
        return {.address = name, .adapter = adapterAddress, .name = name, .pairingDate = platform::dateFromEpoch(date)};
    }

    BusProperties fence{connection, {"org.bluez", "/fence", "org.example.Fence"}, {{"Count", "u"}}, [] {}};
    std::uint32_t fenceCount = 0;
    std::optional<BluezWatches> watches;
    double today = 1000;
    int changes = 0;
};

TEST_F(BluezWatchesTest, AreThePairedOnesUntilTheyAreUnpaired) {
    start({keptWatch("kept", 20), keptWatch("elsewhere", 30, "BB"), keptWatch("gone", 10)});
    runUntil([&] { return watches->isAnswered(); }, "that nobody is there");
    EXPECT_THAT(names(), ElementsAre("gone", "kept", "elsewhere"));
    EXPECT_EQ(changes, 1) << "it has answered";

    MockBluez bluez(loop.event(), bus);
    bluez.addAdapter();
    bluez.addDevice("kept", true);  // what it is, is not told this time
    const std::string older = bluez.addDevice("older", true), renamed = bluez.addWatch("renamed", true);
    bluez.set(older, device, "Class", "u", 0x240704u);
    const std::string unpaired = bluez.addWatch("unpaired", false), headset = bluez.addDevice("headset", true);
    bluez.set(headset, device, "Class", "u", 0x240404u);
    bluez.set(bluez.addDevice("thermometer", true), device, "Appearance", "q", 0x0300);
    bluez.takeName("org.bluez");
    runUntilNames({"kept", "elsewhere", "older", "renamed"});
    EXPECT_EQ(platform::epochSeconds(watches->watches().back().pairingDate), 1000);
    EXPECT_EQ(watches->watches().back().adapter, "AA");

    today = 500;  // the clock was wrong
    bluez.change(renamed, device, "Alias", "s", "my watch");
    bluez.change(unpaired, device, "Paired", "b", 1);
    runUntilNames({"kept", "elsewhere", "unpaired", "older", "my watch"});
    bluez.change(older, device, "Paired", "b", 0);
    runUntilNames({"kept", "elsewhere", "unpaired", "my watch"});
    bluez.remove(renamed);
    runUntilNames({"kept", "elsewhere", "unpaired"});
    today = 2000;
    bluez.change(older, device, "Paired", "b", 1);
    runUntilNames({"kept", "elsewhere", "unpaired", "older"});
    EXPECT_EQ(platform::epochSeconds(watches->watches().back().pairingDate), 2000) << "paired anew";
}

TEST_F(BluezWatchesTest, StayWhileAnythingIsSilent) {
    start();
    const std::string otherPath = "/org/bluez/hci1";
    {
        MockBluez bluez(loop.event(), bus);
        bluez.addAdapter();
        bluez.addWatch("one", true);
        bluez.takeName("org.bluez");
        runUntilNames({"one"});
        const auto objects = bluez.objects;

        bluez.remove(adapterPath + "/dev_one");
        bluez.remove(adapterPath);
        bluez.addAdapter(otherPath, "BB");
        bluez.addWatch("two", true, otherPath);
        bluez.signalAdded(otherPath);
        runUntilNames({"one", "two"});
        runQuestions(bluez, 3);
        bluez.objects.clear();
        bluez.leaveName("org.bluez");
        bluez.takeName("org.bluez");
        runQuestions(bluez, 3);
        bluez.objects = objects;
        bluez.methods["/ GetManagedObjects"] = [&](sd_bus_message*, sd_bus_message*) {
            ++bluez.questions;
            return "org.bluez.Error.NotReady";
        };
        runQuestions(bluez, 2);
        bus.stop();
        runUntil([&] { return !watches->isThere(); }, "the end of the bus");
    }
    bus.start();
    MockBluez bluez(loop.event(), bus);
    bluez.addAdapter();
    bluez.addWatch("one", true);
    bluez.addWatch("three", true);
    bluez.takeName("org.bluez");
    runUntilNames({"one", "three", "two"});
    EXPECT_EQ(changes, 3) << "each has come, and none has ever gone";
    bluez.change(adapterPath + "/dev_one", device, "Alias", "s", "still followed");
    runUntilNames({"still followed", "three", "two"});
}

TEST_F(BluezWatchesTest, AreAnsweredByARefusalOrNonsense) {
    bus.start();
    MockBluez bluez(loop.event(), bus);
    bluez.takeName("org.bluez");
    for (const auto& method : {refusal("org.freedesktop.DBus.Error.AccessDenied"), answer("i", 1)}) {
        bluez.methods["/ GetManagedObjects"] = method;
        SystemBus own(loop.event(), bus.address());
        BluezWatches refused(own, {keptWatch("kept", 1)}, std::chrono::system_clock::now, [&] { ++changes; });
        own.start();
        EXPECT_FALSE(refused.isAnswered());
        runUntil([&] { return refused.isAnswered(); }, "the answer");
        EXPECT_EQ(refused.watches().size(), 1u);
    }
    EXPECT_EQ(changes, 2);
}

TEST_F(BluezWatchesTest, StayForAPauseAfterTheDeviceHasGone) {
    start({keptWatch("kept", 1)}, platform::Duration(3600));
    MockBluez bluez(loop.event(), bus);
    bluez.addAdapter();
    bluez.takeName("org.bluez");
    const std::string one = bluez.addWatch("one", true);
    runUntilNames({"kept", "one"});
    bluez.remove(one);
    runQuestions(bluez, 3);
    EXPECT_THAT(names(), ElementsAre("kept", "one"));
}

TEST_F(BluezWatchesTest, AreFoundInSpiteOfADiscovery) {
    start();
    MockBluez bluez(loop.event(), bus);
    bluez.addAdapter();
    const std::string watch = bluez.addWatch("watch", false), unknown = bluez.addDevice("unknown", false);
    bluez.takeName("org.bluez");
    runUntil([&] { return bluez.questions > 0 && watches->isAnswered(); }, "the answer");
    bluez.change(adapterPath, adapter, "Discovering", "b", 1);
    settle(bluez);
    const int questions = bluez.questions;
    bluez.change(unknown, device, "Appearance", "q", 0x00C0);
    bluez.change(unknown, device, "Paired", "b", 1);
    bluez.emit(watch, device, "RSSI", "n", -60);
    MockService liar(loop.event(), bus);
    liar.emitToEach(watch, device, "Paired", "b", 1);
    settle(bluez);
    EXPECT_EQ(bluez.questions, questions) << "advertisements do not reach the agent, nor does it believe others";
    EXPECT_THAT(names(), IsEmpty());

    bluez.change(adapterPath, adapter, "Discovering", "b", 0);
    runUntilNames({"unknown"});
    bluez.change(adapterPath, adapter, "Discovering", "b", 1);
    settle(bluez);
    bluez.change(watch, device, "Paired", "b", 1);
    runUntilNames({"unknown", "watch"});
    const std::string late = bluez.addWatch("late", true);
    bluez.signalAdded(late);
    runUntilNames({"late", "unknown", "watch"});
    settle(bluez);
    const std::string connecting = bluez.addWatch("connecting", true);  // once nothing was known of it
    bluez.objects[connecting + "/service0001"]["org.bluez.GattService1"];
    bluez.signalAdded(connecting + "/service0001");
    runUntilNames({"connecting", "late", "unknown", "watch"});
}

TEST_F(BluezWatchesTest, AreAskedOnceForTheirSerialNumberAndModel) {
    KnownWatch kept = keptWatch("kept", 1);
    kept.serialNumber = "S0";
    start({kept});
    MockBluez bluez(loop.event(), bus);
    bluez.addAdapter();
    const std::string paths[] = {bluez.addWatch("kept", true), bluez.addWatch("one", true),
                                 bluez.addWatch("two", true)};
    bluez.addFact(paths[0] + "/service1/char1", serialNumber, "S1");
    bluez.addFact(paths[1] + "/service1/char1", serialNumber, std::string("\0 S\xc3\xbc 2 \0 \0", 11));
    bluez.addFact(paths[1] + "/service1/char2", modelNumber, "M2");
    bluez.addFact(paths[2] + "/service1/char1", serialNumber, "S\xff");
    bluez.addFact(paths[2] + "/service1/char2", modelNumber, std::string(257, 'M'));
    bluez.addFact(bluez.addDevice("headset", true) + "/service1/char1", serialNumber, "S3");
    bluez.takeName("org.bluez");
    runUntilNames({"kept", "one", "two"});
    const auto connect = [&](int isConnected) {
        for (const std::string& path : paths) {
            bluez.change(path, device, "Connected", "b", isConnected);
            bluez.change(path, device, "ServicesResolved", "b", isConnected);
        }
        runQuestions(bluez, 2);
    };
    EXPECT_EQ(bluez.reads, 0) << "while they are not connected";
    connect(1);
    runUntil([&] { return bluez.reads == 4; }, "the facts");
    settle(bluez);
    const auto now = watches->watches();
    EXPECT_EQ(now[0].serialNumber, "S0");
    EXPECT_EQ(now[1].serialNumber, "S\xc3\xbc 2");
    EXPECT_EQ(now[1].model, "M2");
    EXPECT_EQ(now[2].serialNumber, std::nullopt);
    EXPECT_EQ(now[2].model, std::nullopt);
    runQuestions(bluez, 2);
    EXPECT_EQ(bluez.reads, 4) << "not again during this connection";
    connect(0);
    bluez.addFact(paths[2] + "/service1/char1", serialNumber, "S4");
    connect(1);
    runUntil([&] { return watches->watches()[2].serialNumber == "S4"; }, "the next attempt");
    runUntil([&] { return bluez.reads == 6; }, "only what is missing");
}

TEST_F(BluezWatchesTest, StayWhenTheAnswerIsBroken) {
    start();
    MockBluez bluez(loop.event(), bus);
    bluez.addAdapter();
    const std::string one = bluez.addWatch("one", true), two = bluez.addWatch("two", true);
    bluez.takeName("org.bluez");
    runUntilNames({"one", "two"});
    const auto objects = bluez.objects;
    const int before = changes;

    // A bad property costs itself alone.
    bluez.set(one, device, "Paired", "s", "no");
    bluez.set(one, device, "Appearance", "s", "watch");
    bluez.set(one, device, "Alias", "u", 1u);
    bluez.set(two, device, "Alias", "s", std::string(257, 'x'));
    runQuestions(bluez, 3);
    bluez.objects.erase(two);
    bluez.set(one, device, "Address", "u", 1u);
    runQuestions(bluez, 3);
    bluez.objects = objects;
    bluez.objects.erase(two);
    for (int i = 0; i < 64; ++i) bluez.addWatch("w" + std::to_string(i), true);
    runQuestions(bluez, 3);
    const auto answer = bluez.methods["/ GetManagedObjects"];
    bluez.methods["/ GetManagedObjects"] = [&](sd_bus_message*, sd_bus_message* reply) {
        ++bluez.questions;
        sd_bus_message_append(reply, "a{oa{sv}}", 0);
        return std::nullopt;
    };
    runQuestions(bluez, 3);
    for (const char* member : {"InterfacesAdded", "InterfacesRemoved"})
        bluez.emitSignal(nullptr, "/", manager, member,
                         [&](sd_bus_message* signal) { sd_bus_message_append(signal, "os", one.c_str(), device); });
    bluez.emit(one, device, "Paired", "i", 0);
    settle(bluez);
    EXPECT_THAT(names(), ElementsAre("one", "two"));
    EXPECT_EQ(changes, before);

    bluez.methods["/ GetManagedObjects"] = answer;
    bluez.objects.erase(one);
    runQuestions(bluez, 1);
    runUntil([&] { return names().size() == 64; }, "as many as are taken");
}

}  // namespace
}  // namespace vrx::host
