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
    Value value = platform::Dictionary{
        {"date", platform::dateFromEpoch(1.25)}, {"text", std::string("bot\0tom", 7)}, {"last", "the very bottom"}};
    for (int depth = 1; depth < platform::limits::documentDepth; ++depth)
        value = platform::Dictionary{{"inner", value}};
    return value;
}

TEST_F(StockTools, SeeTheDeepestRecordWhole) {
    agent->record = deepestRecord();
    serve({});  // by threads that see it
    for (const std::string& command : {busctl(std::string(busctlCall) + "getAllDeviceInfosUsingPolicy tb 0 false"),
                                       gdbus("getAllDeviceInfosUsingPolicy", "0 false"),
                                       dbusSend("getAllDeviceInfosUsingPolicy", "uint64:0 boolean:false")}) {
        ToolRun result = run(command);
        EXPECT_EQ(result.status, 0) << command << "\n" << result.output;
        EXPECT_NE(result.output.find("the very bottom"), std::string::npos) << command << "\n" << result.output;
        EXPECT_NE(result.output.find("1.25"), std::string::npos) << command << "\n" << result.output;
    }
}

TEST_F(StockTools, FindTheInterfaceAndItsErrors) {
    ToolRun introspection = run(busctl("introspect com.orvane.vrxagent /com/orvane/vrxagent"));
    for (const wire::Operation& operation : wire::operations)
        EXPECT_NE(introspection.output.find("." + std::string(operation.member) + " "), std::string::npos)
            << introspection.output;
    EXPECT_NE(run(busctl("call com.orvane.vrxagent / org.freedesktop.DBus.Peer GetMachineId")).output.find("s \""),
              std::string::npos);
    EXPECT_NE(run(dbusSend("noSuchThing", "")).output.find("UnknownMethod"), std::string::npos);
    EXPECT_NE(run(dbusSend("checkIsAvailableInStore", "uint32:7")).output.find("InvalidArgs"), std::string::npos);
}

TEST_F(StockTools, AreToldWhyTheyAreRefused) {
    serve({}, false);
    for (const std::string& command : {gdbus("defaultDevice", ""), dbusSend("defaultDevice", "")}) {
        ToolRun result = run(command);
        EXPECT_NE(result.status, 0);
        EXPECT_NE(result.output.find("does not hold the entitlement test.entitlement"), std::string::npos)
            << command << "\n"
            << result.output;
    }
    // This one has a text of its own for it.
    EXPECT_NE(run(busctl(std::string(busctlCall) + "defaultDevice")).output.find("Access denied"), std::string::npos);
}

}  // namespace
}  // namespace vrx::test
