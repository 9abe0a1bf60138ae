// Stock D-Bus tools as clients: they share no code with the agent's own ends.
#include <gtest/gtest.h>

#include <array>
#include <cstdio>

#include "client/fake_agent.h"

namespace vrx::test {
namespace {

struct ToolRun {
    int status;
    std::string output;
};

ToolRun run(const std::string& command) {
    FILE* pipe = popen((command + " 2>&1").c_str(), "r");
    ToolRun run{0, {}};
    std::array<char, 4096> buffer;
    while (std::size_t size = fread(buffer.data(), 1, buffer.size(), pipe)) run.output.append(buffer.data(), size);
    run.status = pclose(pipe);
    return run;
}

std::string busctl(const FakeService& service, const std::string& arguments) {
    return "busctl --address=unix:path=" + service.socketPath() + " " + arguments;
}

std::string gdbus(const FakeService& service, const std::string& member, const std::string& arguments) {
    return "gdbus call --address unix:path=" + service.socketPath() +
           " --dest com.orvane.vrxagent --object-path /com/orvane/vrxagent --method com.orvane.VRXAgentProtocol." +
           member + " " + arguments;
}

std::string dbusSend(const FakeService& service, const std::string& member, const std::string& arguments) {
    return "dbus-send --peer=unix:path=" + service.socketPath() +
           " --print-reply /com/orvane/vrxagent com.orvane.VRXAgentProtocol." + member + " " + arguments;
}

constexpr const char* busctlCall =
    "--json=short call com.orvane.vrxagent /com/orvane/vrxagent com.orvane.VRXAgentProtocol ";

// A document as deep as one may be, dictionaries throughout, with what takes most room in the encoding at its bottom.
Value deepestRecord() {
    Value value = platform::Dictionary{
        {"date", platform::dateFromEpoch(1.25)}, {"text", std::string("bot\0tom", 7)}, {"last", "the very bottom"}};
    for (int depth = 1; depth < platform::limits::documentDepth; ++depth)
        value = platform::Dictionary{{"inner", value}};
    return value;
}

TEST(StockTools, SeeTheDeepestRecordWhole) {
    auto agent = std::make_shared<FakeAgent>();
    agent->record = deepestRecord();
    FakeService service(agent);
    for (const std::string& command :
         {busctl(service, std::string(busctlCall) + "getAllDeviceInfosUsingPolicy tb 0 false"),
          gdbus(service, "getAllDeviceInfosUsingPolicy", "0 false"),
          dbusSend(service, "getAllDeviceInfosUsingPolicy", "uint64:0 boolean:false")}) {
        ToolRun result = run(command);
        EXPECT_EQ(result.status, 0) << command << "\n" << result.output;
        EXPECT_NE(result.output.find("the very bottom"), std::string::npos) << command << "\n" << result.output;
        EXPECT_NE(result.output.find("1.25"), std::string::npos) << command << "\n" << result.output;
    }
}

TEST(StockTools, FindTheInterfaceAndItsErrors) {
    FakeService service(std::make_shared<FakeAgent>());
    ToolRun introspection = run(busctl(service, "introspect com.orvane.vrxagent /com/orvane/vrxagent"));
    for (const wire::Operation& operation : wire::operations)
        EXPECT_NE(introspection.output.find("." + std::string(operation.member) + " "), std::string::npos)
            << introspection.output;
    EXPECT_NE(
        run(busctl(service, "call com.orvane.vrxagent / org.freedesktop.DBus.Peer GetMachineId")).output.find("s \""),
        std::string::npos);
    EXPECT_NE(run(dbusSend(service, "noSuchThing", "")).output.find("UnknownMethod"), std::string::npos);
    EXPECT_NE(run(dbusSend(service, "checkIsAvailableInStore", "uint32:7")).output.find("InvalidArgs"),
              std::string::npos);
}

TEST(StockTools, AreToldWhyTheyAreRefused) {
    FakeService service(std::make_shared<FakeAgent>(), {}, false);
    for (const std::string& command : {gdbus(service, "defaultDevice", ""), dbusSend(service, "defaultDevice", "")}) {
        ToolRun result = run(command);
        EXPECT_NE(result.status, 0);
        EXPECT_NE(result.output.find("does not hold the entitlement test.entitlement"), std::string::npos)
            << command << "\n"
            << result.output;
    }
    // This one has a text of its own for it.
    EXPECT_NE(run(busctl(service, std::string(busctlCall) + "defaultDevice")).output.find("Access denied"),
              std::string::npos);
}

}  // namespace
}  // namespace vrx::test
