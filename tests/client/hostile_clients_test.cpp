// Clients that err or mean harm: each is dealt with alone, and the agent goes on serving others.
#include <poll.h>
#include <sys/resource.h>

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

TEST_F(HostileClients, SendLongStrings) {
    const std::string longer(1025, 'x'), tooLong(16 * 1024, 'x');
    RawClient client = rawClient(RawClient::authentication() + RawClient::call("checkIsAvailableInStore", 1, &longer));
    EXPECT_TRUE(client.readUntil("InvalidArgs"));
    client.write(RawClient::call("defaultDevice", 2));
    EXPECT_TRUE(client.readUntil("Phone")) << "the connection stays";
    client = rawClient(RawClient::authentication() + RawClient::call("checkIsAvailableInStore", 1, &tooLong));
    EXPECT_TRUE(client.isClosedByAgent()) << "although it came together with the authentication";
    EXPECT_EQ(agent->requests().size(), 1u);
}

TEST_F(HostileClients, SendABodyThatDoesNotHoldTheArguments) {
    const std::string text("\4\0\0\0text\0", 9), policy("\1\0\0\0\0\0\0\0", 8), yes("\1\0\0\0", 4);
    struct {
        const char* member;
        const char* signature;
        std::string body;
    } cases[] = {{"dismissFollowUpForSerialNumber", "s", std::string("\x64\0\0\0text", 8)},  // a hundred bytes follow
                 {"dismissFollowUpForSerialNumber", "s", text + "left"},
                 {"defaultDevice", "", "left"},
                 {"getAllDeviceInfosUsingPolicy", "tb", policy + std::string("\2\0\0\0", 4)},
                 {"getAllDeviceInfosUsingPolicy", "tb", policy + std::string("\0\0\0\1", 4)},
                 {"getAllDeviceInfosUsingPolicy", "tb", policy + yes + "left"}};
    for (const auto& [member, signature, body] : cases) {
        RawClient client = rawClient(RawClient::authentication() + RawClient::call(member, 1, signature, body));
        EXPECT_TRUE(client.readUntil("InvalidArgs")) << member << testing::PrintToString(body);
    }
    EXPECT_TRUE(agent->requests().empty()) << "nothing is dismissed";
    RawClient client =
        rawClient(RawClient::authentication() + RawClient::call("getAllDeviceInfosUsingPolicy", 1, "tb", policy + yes) +
                  RawClient::call("dismissFollowUpForSerialNumber", 2, "s", text));
    EXPECT_TRUE(client.readUntil("Phone"));
    eventually([&] { return agent->requests().size() == 2; }, "what is sound");
}

TEST_F(HostileClients, SendNothingMoreAndReadOn) {
    holdOutreach();
    RawClient client = rawClient(RawClient::authentication() + RawClient::call("scheduleOutreachWithReply", 1));
    shutdown(client.file(), SHUT_WR);
    awaitHeld();
    answerHeld();
    EXPECT_TRUE(client.readUntil("\x01u"));
    EXPECT_TRUE(client.isClosedByAgent());
}

// What is written is answered; the rest is not accepted.
TEST_F(HostileClients, WriteWhileTheAgentEnds) {
    RawClient client = rawClient(RawClient::authentication() + RawClient::call("defaultDevice", 1));
    ASSERT_TRUE(client.readUntil("Phone"));
    std::atomic<bool> isWritten = true;
    service->onEnding = [&] { isWritten = client.write(RawClient::call("readWebURLOverride", 2)); };
    service->exitCleanWhenIdle();
    service->waitForEnd(1);
    EXPECT_FALSE(isWritten);
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

TEST_F(HostileClients, HangUpAndLeaveTheirRequests) {
    serve({.requests = 2});
    holdOutreach();
    const auto leaveRequest = [&] {
        RawClient leaving = rawClient(RawClient::authentication() + RawClient::call("scheduleOutreachWithReply", 1));
        EXPECT_TRUE(leaving.readUntil("OK"));
    };
    for (int i = 1; i <= 2; ++i) {
        leaveRequest();
        awaitHeld(i);
    }
    for (int i = 0; i < 20; ++i) leaveRequest();
    RawClient client = rawClient(RawClient::authentication() + RawClient::call("defaultDevice", 1));
    EXPECT_TRUE(client.readUntil("OK")) << "it is let in";
    EXPECT_EQ(held, 2);
    answerHeld();
    EXPECT_TRUE(client.readUntil("Phone")) << "and served once there is a place";
}

TEST_F(HostileClients, TakeEverySeatWithoutLeavingOneForAnotherUser) {
    if (getuid() != 0) GTEST_SKIP() << "needs another user";
    serve({.connections = 3});
    holdOutreach();
    std::vector<RawClient> clients;
    for (const char* call : {"scheduleOutreachWithReply", "defaultDevice", "defaultDevice"}) {
        clients.push_back(rawClient(RawClient::authentication() + RawClient::call(call, 1)));
        if (clients.size() > 1) {
            ASSERT_TRUE(clients.back().readUntil("Phone"));
        }
    }
    awaitHeld();
    const std::string path = service->socketPath();
    std::filesystem::permissions(path, std::filesystem::perms(0666));
    std::filesystem::permissions(path.substr(0, path.rfind('/')), std::filesystem::perms(0711));
    const auto isServed = [&] {
        return host::endOf(host::inChild([&] {
                   if (setuid(65534) != 0) _exit(2);
                   RawClient other(path);
                   other.write(RawClient::authentication() + RawClient::call("defaultDevice", 1));
                   _exit(other.readUntil("Phone") ? 0 : 1);
               })) == 0;
    };
    eventually(isServed, "a seat, once the agent is done with the others' requests");
    pollfd idle[] = {{clients[1].file(), POLLRDHUP, 0}, {clients[2].file(), POLLRDHUP, 0}};
    EXPECT_EQ(poll(idle, 2, 60'000), 1) << "one that has been idle";
    clients[0].write(RawClient::call("defaultDevice", 2));
    EXPECT_TRUE(clients[0].readUntil("Phone")) << "one with a request open keeps its seat";
    answerHeld();
}

// Without a rest the listener would try again as fast as it can.
TEST_F(HostileClients, UseUpTheDescriptors) {
    if (host::isSanitized) GTEST_SKIP() << "the sanitizers need descriptors themselves";
    expectGoesOn();
    rlimit before{};
    getrlimit(RLIMIT_NOFILE, &before);
    const host::Descriptor client(socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0));
    rlimit low = before;
    low.rlim_cur = static_cast<rlim_t>(client.number()) + 1;
    setrlimit(RLIMIT_NOFILE, &low);
    EXPECT_TRUE(connectTo(client.number(), addressOf(service->socketPath())));
    const auto hasSaidSo = [&] { return service->logged("Clients have to wait") > 0; };
    eventually(hasSaidSo, "the line in the log");
    setrlimit(RLIMIT_NOFILE, &before);
    expectGoesOn();
    EXPECT_EQ(service->logged("Clients have to wait"), 1);
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
