// Stock D-Bus tools as clients: they share no code with the agent's own ends.
#include <cstdio>

#include "client/fake_service.h"
#include "vrx/platform/limits.h"
#include "vrx/wire/names.h"

namespace vrx::test {
namespace {

// What a tool says, and then the status with which it ended.
std::string run(const std::string& command) {
    FILE* pipe = popen(("(" + command + ") 2>&1; echo status $?").c_str(), "r");
    std::string output;
    std::array<char, 4096> buffer;
    while (std::size_t size = fread(buffer.data(), 1, buffer.size(), pipe)) output.append(buffer.data(), size);
    pclose(pipe);
    return output;
}

class StockTools : public WithFakeAgent {
protected:
    std::string busctl(const std::string& arguments) const {
        return "busctl --address=unix:path=" + service->socketPath() + " " + arguments;
    }
    std::string gdbus(const std::string& member, const std::string& arguments) const {
        return "gdbus call --address unix:path=" + service->socketPath() +
               " --dest com.orvane.vrxagent --object-path /com/orvane/vrxagent --method com.orvane.VRXAgentProtocol." +
               member + " " + arguments;
    }
    std::string dbusSend(const std::string& member, const std::string& arguments) const {
        return "dbus-send --peer=unix:path=" + service->socketPath() +
               " --print-reply /com/orvane/vrxagent com.orvane.VRXAgentProtocol." + member + " " + arguments;
    }
};

constexpr const char* busctlCall =
    "--json=short call com.orvane.vrxagent /com/orvane/vrxagent com.orvane.VRXAgentProtocol ";

// A document as deep as one may be, dictionaries throughout, with what takes most room in the encoding at its bottom.
Value deepestRecord() {
    Value value =
        Dictionary{{"date", dateFromEpoch(1.25)}, {"text", std::string("bot\0tom", 7)}, {"last", "the very bottom"}};
    for (int depth = 1; depth < platform::limits::documentDepth; ++depth) value = Dictionary{{"inner", value}};
    return value;
}

TEST_F(StockTools, SeeTheDeepestRecordWhole) {
    agent->record = deepestRecord();
    serve({});  // by threads that see it
    for (const std::string& command : {busctl(std::string(busctlCall) + "getAllDeviceInfosUsingPolicy tb 0 false"),
                                       gdbus("getAllDeviceInfosUsingPolicy", "0 false"),
                                       dbusSend("getAllDeviceInfosUsingPolicy", "uint64:0 boolean:false")})
        EXPECT_THAT(run(command), AllOf(HasSubstr("the very bottom"), HasSubstr("1.25"), HasSubstr("status 0")))
            << command;
}

TEST_F(StockTools, FindTheInterfaceAndItsErrors) {
    const std::string introspection = run(busctl("introspect com.orvane.vrxagent /com/orvane/vrxagent"));
    for (const wire::Operation& operation : wire::operations)
        EXPECT_THAT(introspection, HasSubstr("." + std::string(operation.member) + " "));
    EXPECT_THAT(run(busctl("call com.orvane.vrxagent / org.freedesktop.DBus.Peer GetMachineId")), HasSubstr("s \""));
    EXPECT_THAT(run(dbusSend("noSuchThing", "")), HasSubstr("UnknownMethod"));
    EXPECT_THAT(run(dbusSend("checkIsAvailableInStore", "uint32:7")), HasSubstr("InvalidArgs"));
}

TEST_F(StockTools, AreToldWhyTheyAreRefused) {
    serve({}, false);
    for (const std::string& command : {gdbus("defaultDevice", ""), dbusSend("defaultDevice", "")})
        EXPECT_THAT(run(command),
                    AllOf(HasSubstr("does not hold the entitlement test.entitlement"), HasSubstr("status 1")))
            << command;
    // This one has a text of its own for it.
    EXPECT_THAT(run(busctl(std::string(busctlCall) + "defaultDevice")), HasSubstr("Access denied"));
}

}  // namespace
}  // namespace vrx::test
