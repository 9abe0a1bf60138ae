// Clients that err or mean harm: each is dealt with alone, and the agent goes on serving others.
#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/wait.h>

#include "client/fake_agent.h"
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
    std::string huge = RawClient::call("defaultDevice", 1);
    huge[7] = 5;  // 80 MiB of body are to come
    const std::string half = RawClient::call("defaultDevice", 1).substr(0, 40);
    for (const std::string& bytes : {std::string("GET / HTTP/1.1\r\n\r\n"), std::string(100'000, '\0'),
                                     RawClient::authentication() + std::string(64, '\xff'),
                                     std::string(1, '\0') + "AUTH EXTERNAL 39393939\r\nBEGIN\r\n"}) {
        RawClient client = rawClient(bytes);
        shutdown(client.file(), SHUT_WR);
        EXPECT_TRUE(client.isClosedByAgent());
    }
    {
        RawClient client = rawClient(RawClient::authentication() + half);
        shutdown(client.file(), SHUT_WR);
        EXPECT_TRUE(client.isClosedByAgent());
    }
    {
        RawClient client = rawClient(RawClient::authentication());
        ASSERT_TRUE(client.readUntil("OK "));
        client.write(RawClient::call("defaultDevice", 1));
        ASSERT_TRUE(client.readUntil("Phone"));
        client.write(huge);
        EXPECT_TRUE(client.isClosedByAgent()) << "a message is too long, by its header";
    }
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
    while (!connection.defaultDevice()) std::this_thread::yield();
}

// The programs of others must not use what this one was entitled to.
TEST_F(HostileClients, HandTheirConnectionToAnotherProcess) {
    const std::string call = RawClient::call("readWebURLOverride", 2);
    RawClient client = rawClient(RawClient::authentication() + RawClient::call("defaultDevice", 1));
    ASSERT_TRUE(client.readUntil("Phone"));
    if (const pid_t child = fork(); child == 0) {
        [[maybe_unused]] ssize_t size = write(client.file(), call.data(), call.size());
        _exit(0);
    }
    EXPECT_TRUE(client.isClosedByAgent());
    wait(nullptr);
    EXPECT_EQ(agent->requests().size(), 1u);
}

TEST_F(HostileClients, RunAnotherProgram) {
    const std::string path = service->socketPath();
    const std::string first = RawClient::authentication() + RawClient::call("defaultDevice", 1);
    const std::string callFile = path + ".call";
    {
        const int file = open(callFile.c_str(), O_WRONLY | O_CREAT | O_CLOEXEC, 0600);
        const std::string second = RawClient::call("readWebURLOverride", 2);
        ASSERT_EQ(write(file, second.data(), second.size()), static_cast<ssize_t>(second.size()));
        close(file);
    }
    if (const pid_t child = fork(); child == 0) {
        sockaddr_un address{};
        address.sun_family = AF_UNIX;
        std::memcpy(address.sun_path, path.c_str(), path.size());
        const int file = socket(AF_UNIX, SOCK_STREAM, 0);
        char buffer[4096];
        if (connect(file, reinterpret_cast<const sockaddr*>(&address), sizeof address) == 0 &&
            write(file, first.data(), first.size()) > 0)
            for (std::size_t size = 0; !memmem(buffer, size, "Phone", 5);)
                size += static_cast<std::size_t>(read(file, buffer + size, sizeof buffer - size));
        dup2(file, 0);
        dup2(open("/dev/null", O_WRONLY), 1);
        // It writes the call itself, in the process that connected, and then reads to the end.
        execl("/usr/bin/perl", "perl", "-e",
              "open(C,'<',$ARGV[0]);local $/;$c=<C>;open(S,'+<&=0');syswrite(S,$c);while(sysread(S,$b,4096)){}",
              callFile.c_str(), nullptr);
        _exit(1);
    }
    int status = 0;
    wait(&status);
    EXPECT_EQ(status, 0);
    EXPECT_EQ(agent->requests().size(), 1u);
    unlink(callFile.c_str());
}

}  // namespace
}  // namespace vrx::test
