// Clients that err or mean harm: each is dealt with alone, and the agent goes on serving others.
#include <gtest/gtest.h>

#include "client/fake_service.h"
#include "client/raw_client.h"

namespace vrx::test {
namespace {

class HostileClients : public WithFakeAgent {
protected:
    RawClient rawClient(const std::string& bytes = "") const {
        RawClient client(service->socketPath());
        client.write(bytes);
        return client;
    }
    void expectGoesOn() const {
        auto answer = client::AgentConnection(options()).defaultDevice();
        EXPECT_TRUE(answer) << answer.failure().text;
    }
};

TEST_F(HostileClients, AuthenticateAndCallInOneWrite) {
    for (int round = 0; round < 200; ++round) {
        RawClient client = rawClient(RawClient::authentication() + RawClient::call("defaultDevice", 1) +
                                     RawClient::call("readWebURLOverride", 2));
        ASSERT_TRUE(client.readUntil("Phone")) << round;
        ASSERT_TRUE(client.readUntil("https://web.example")) << round;
    }
}

TEST_F(HostileClients, WriteGarbage) {
    const std::string authentication = RawClient::authentication(), call = RawClient::call("defaultDevice", 1);
    for (const std::string& bytes :
         {std::string("GET / HTTP/1.1\r\n\r\n"), std::string(100'000, '\0'), authentication + std::string(64, '\xff'),
          std::string(1, '\0') + "AUTH EXTERNAL 39393939\r\nBEGIN\r\n", authentication + call.substr(0, 40)}) {
        RawClient client = rawClient(bytes);
        shutdown(client.file(), SHUT_WR);
        EXPECT_TRUE(client.isClosedByAgent());
    }
    std::string huge = call;
    huge[7] = 5;  // 80 MiB of body are to come
    RawClient client = rawClient(authentication + call);
    ASSERT_TRUE(client.readUntil("Phone"));
    client.write(huge);
    EXPECT_TRUE(client.isClosedByAgent()) << "a message is too long, by its header";
    expectGoesOn();
    EXPECT_EQ(agent->requests().size(), 2u);
}

TEST_F(HostileClients, NeverSpeak) {
    serve({.authentication = std::chrono::milliseconds(1)});
    EXPECT_TRUE(rawClient().isClosedByAgent());
}

TEST_F(HostileClients, SendAStringOfAMebibyte) {
    const std::string text(1 << 20, 'x');
    RawClient client = rawClient(RawClient::authentication() + RawClient::call("checkIsAvailableInStore", 1, &text));
    EXPECT_TRUE(client.readUntil("InvalidArgs"));
    client.write(RawClient::call("defaultDevice", 2));
    EXPECT_TRUE(client.readUntil("Phone")) << "the connection stays";
}

TEST_F(HostileClients, VanishWithARequestOpen) {
    holdOutreach();
    RawClient client = rawClient(RawClient::authentication() + RawClient::call("scheduleOutreachWithReply", 1));
    awaitHeld();
    client.close();
    expectGoesOn();
    answerHeld();
}

TEST_F(HostileClients, OpenTooManyRequests) {
    serve({.requestsPerConnection = 2});
    holdOutreach();
    RawClient client = rawClient(RawClient::authentication());
    for (std::uint32_t serial = 1; serial <= 3; ++serial)
        client.write(RawClient::call("scheduleOutreachWithReply", serial));
    EXPECT_TRUE(client.readUntil("LimitsExceeded")) << "the third comes while two wait for their replies";
    EXPECT_EQ(held, 2);
    answerHeld();
}

TEST_F(HostileClients, ComeTwoHundredAtOnce) {
    std::vector<RawClient> clients;
    for (int i = 0; i < 200; ++i) clients.push_back(rawClient());
    int served = 0;
    int refused = 0;
    for (RawClient& client : clients) {
        client.write(RawClient::authentication() + RawClient::call("defaultDevice", 1));
        served += client.readUntil("\x01u") && client.readUntil("Phone");
        refused += client.received().find("LimitsExceeded") != std::string::npos;
    }
    EXPECT_EQ(served, 64);
    EXPECT_GT(refused, 0);
    // A place is free once the agent has seen a client go: asked until it has.
    clients.clear();
    client::AgentConnection connection(options());
    eventually([&] { return bool(connection.defaultDevice()); }, "a free place");
}

// The programs of others must not use what this one was entitled to.
TEST_F(HostileClients, HandTheirConnectionToAnotherProcess) {
    const std::string call = RawClient::call("readWebURLOverride", 2);
    RawClient client = rawClient(RawClient::authentication() + RawClient::call("defaultDevice", 1));
    ASSERT_TRUE(client.readUntil("Phone"));
    const pid_t child = host::inChild([&] { client.write(call); });
    EXPECT_TRUE(client.isClosedByAgent());
    EXPECT_EQ(host::endOf(child), 0);
    EXPECT_EQ(agent->requests().size(), 1u);
}

TEST_F(HostileClients, RunAnotherProgram) {
    const std::string path = service->socketPath();
    const std::string first = RawClient::authentication() + RawClient::call("defaultDevice", 1);
    const std::string callFile = path + ".call";
    host::writeFile(callFile, RawClient::call("readWebURLOverride", 2));
    const pid_t child = host::inChild([&] {
        RawClient client(path);
        if (!client.write(first) || !client.readUntil("Phone")) _exit(1);
        dup2(client.file(), 0);
        dup2(open("/dev/null", O_WRONLY), 1);
        // It writes the call itself, in the process that connected, and then reads to the end.
        execl("/usr/bin/perl", "perl", "-e",
              "open(C,'<',$ARGV[0]);local $/;$c=<C>;open(S,'+<&=0');syswrite(S,$c);while(sysread(S,$b,4096)){}",
              callFile.c_str(), nullptr);
        _exit(2);
    });
    EXPECT_EQ(host::endOf(child), 0);
    EXPECT_EQ(agent->requests().size(), 1u);
}

}  // namespace
}  // namespace vrx::test
