#include "vrx/host/bus/hardware_serial.h"

#include <sys/stat.h>

#include "host/bus/mock_bus.h"

namespace vrx::host {
namespace {

using State = HardwareSerial::State;

constexpr const char* hostName = "org.freedesktop.hostname1";
constexpr const char* hostMethod = "/org/freedesktop/hostname1 GetHardwareSerial";

class HardwareSerialTest : public BusTest {
protected:
    void runUntilState(State state) {
        runUntil([&] { return serial.state() == state; }, "the state");
    }
    void runUntilThere(bool isThere) {
        runUntil([&] { return serial.isThere() == isThere; }, "the service's coming or going");
    }

    // The bus starts that line of shell as the service, each time with another line in the file "started".
    void becomeStartable(const std::string& command) const {
        writeFile(folder / (std::string(hostName) + ".service"), "[D-BUS Service]\nName=" + std::string(hostName) +
                                                                     "\nUser=root\nExec=/bin/sh -c 'echo >> " +
                                                                     folder / "started" + "; " + command + "'\n");
    }

    int changes = 0;
    HardwareSerial serial{connection, [this] { ++changes; }};
};

TEST_F(HardwareSerialTest, IsAskedOnceAndNeverKeepsTheServiceAlive) {
    EXPECT_FALSE(connection.hasSocket());
    const std::string started = folder / "started";
    becomeStartable("exit 1");
    bus.start();
    EXPECT_TRUE(connection.hasSocket());
    connection.start();
    MockService host(loop.event(), bus);
    host.methods[hostMethod] = answer("s", "  F2L \n");
    host.takeName(hostName);
    runUntilThere(true);
    host.leaveName(hostName);
    runUntilThere(false);
    EXPECT_EQ(host.calls, 0) << "nobody wants it yet";

    serial.startAsking();
    EXPECT_FALSE(serial.isSettled());
    runUntilState(State::Absent);  // the service ends at once
    EXPECT_EQ(std::filesystem::file_size(started), 1);
    for (int i = 0; i < 3; ++i) {
        host.takeName(hostName);
        runUntilThere(true);
        runUntilState(State::Known);
        host.leaveName(hostName);
        runUntilThere(false);
    }
    EXPECT_EQ(host.calls, 1);
    EXPECT_EQ(serial.value(), "F2L");
    EXPECT_EQ(changes, 2);
    EXPECT_EQ(std::filesystem::file_size(started), 1) << "its leaving starts it again";

    bus.stop();
    runUntil([&] { return !connection.hasSocket() && !serial.isThere(); }, "the end of the bus");
    EXPECT_EQ(serial.value(), "F2L");
}

TEST_F(HardwareSerialTest, IsAskedOnceOfTheServiceThatTheQuestionStarts) {
    const std::string gate = folder / "gate";
    ASSERT_EQ(mkfifo(gate.c_str(), 0600), 0);
    const Descriptor holdingIt(open(gate.c_str(), O_RDWR | O_CLOEXEC));  // the started program lives as long
    becomeStartable("read line < " + gate);
    bus.start();
    MockService host(loop.event(), bus);
    host.methods[hostMethod] = answer("s", "F2L");
    serial.startAsking();
    connection.start();
    runUntil([&] { return std::filesystem::exists(folder / "started"); }, "the question");
    host.takeName(hostName);
    runUntilState(State::Known);
    for (int i = 0; i < 2; ++i) {
        host.leaveName(hostName);
        runUntilThere(false);
        host.takeName(hostName);
        runUntilThere(true);
    }
    EXPECT_EQ(host.calls, 1);
    EXPECT_EQ(changes, 1);
}

TEST_F(HardwareSerialTest, IsAbsentWhereItIsRefusedOrMeansNothing) {
    const std::string error = "org.freedesktop.DBus.Error.";
    const std::string tooLong(257, 'F');
    const MockService::Method answers[] = {refusal(error + "InteractiveAuthorizationRequired"),
                                           refusal(error + "FileNotFound"),
                                           answer("s", ""),
                                           answer("s", "To be filled by O.E.M."),
                                           answer("s", "F2\nL"),
                                           answer("s", tooLong.c_str()),
                                           answer("u", 42u),
                                           [](auto...) { return std::nullopt; }};
    bus.start();
    MockService host(loop.event(), bus);
    for (const auto& method : answers) {
        host.calls = 0;
        host.methods[hostMethod] = method;
        host.takeName(hostName);
        SystemBus own(loop.event(), bus.address());
        HardwareSerial refused(own, [] {});
        refused.startAsking();
        EXPECT_EQ(refused.state(), State::Unknown);
        own.start();
        runUntil([&] { return refused.isSettled(); }, "the answer");
        EXPECT_EQ(refused.state(), State::Absent) << &method - answers;
        EXPECT_FALSE(refused.value());
        host.leaveName(hostName);
        runUntil([&] { return !refused.isThere(); }, "its going");
        host.takeName(hostName);
        runUntil([&] { return refused.isThere(); }, "its coming");
        EXPECT_EQ(host.calls, 1) << "it has answered, and is not asked again";
        host.leaveName(hostName);
    }
}

}  // namespace
}  // namespace vrx::host
