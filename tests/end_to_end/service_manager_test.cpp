// The agent under a service manager, which the test stands in for: notices, the socket handed over, its capability.
#include <poll.h>
#include <sys/inotify.h>
#include <sys/stat.h>

#include <csignal>

#include "client/raw_client.h"
#include "end_to_end/programs.h"
#include "support/eventually.h"
#include "vrx/host/ipc/listening_socket.h"

namespace vrx::end_to_end {
namespace {

class ServiceManager : public AtPlace {
protected:
    std::unique_ptr<Process> startAgent(int listeningSocket = -1, const std::string& variable = "NONE=") const {
        return std::make_unique<Process>(place_.path(), VRX_PROGRAMS "/vrxagent",
                                         Arguments{"--home", place_ / "home", "--socket", place_ / "socket"},
                                         Arguments{notices_.variable(), variable},
                                         Handed{.listeningSocket = listeningSocket});
    }

    const NoticeSocket notices_{place_ / "notices"};
};

// Clients connect to a socket that is the service manager's; who answers them there may change.
TEST_F(ServiceManager, HandsItsSocketToOneAgentAfterTheOther) {
    host::ListeningSocket listening;
    ASSERT_FALSE(listening.open(place_ / "socket"));
    for (int round = 1; round <= 2; ++round) {
        Process early(place_.path(), place_ / "app/vrxctl", {"--socket", place_ / "socket", "device"});
        const std::unique_ptr<Process> agent = startAgent(listening.number());
        EXPECT_EQ(notices_.next(*agent), "READY=1") << agent->errors();
        EXPECT_EQ(early.wait(), 0) << early.errors();
        EXPECT_EQ(place_.vrxctl({"device"}).code, 0);
        agent->signal(SIGTERM);
        EXPECT_EQ(notices_.next(*agent), "STOPPING=1");
        EXPECT_EQ(agent->wait(), 0) << agent->errors();
    }
}

// The notice is held up in a full queue: the socket must be there by then.
TEST_F(ServiceManager, HearsThatTheAgentIsReadyWhenClientsCanConnect) {
    const host::Descriptor filler(socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC | SOCK_NONBLOCK, 0));
    ASSERT_TRUE(connectTo(filler.number(), addressOf(place_ / "notices")));
    std::size_t fillings = 0;
    while (send(filler.number(), "x", 1, 0) == 1) ++fillings;
    const host::Descriptor folder(inotify_init1(IN_CLOEXEC));
    inotify_add_watch(folder.number(), place_.path().c_str(), IN_MOVED_TO);

    const std::unique_ptr<Process> agent = startAgent();
    std::array<pollfd, 2> files{{{folder.number(), POLLIN, 0}, {agent->endedFile(), POLLIN, 0}}};
    poll(files.data(), files.size(), 10'000);  // it comes in no time, or never
    EXPECT_TRUE(test::RawClient(place_ / "socket").isConnected()) << agent->errors();
    while (fillings-- > 0) EXPECT_EQ(notices_.next(*agent), "x");
    EXPECT_EQ(notices_.next(*agent), "READY=1");
}

// An agent whose main loop goes on says so at least that often.
TEST_F(ServiceManager, IsToldAgainAndAgainThatTheAgentIsAlive) {
    const std::unique_ptr<Process> agent = startAgent(-1, "WATCHDOG_USEC=400000");
    ASSERT_TRUE(eventually([&] { return notices_.next(*agent) == "READY=1"; }, "the agent")) << agent->errors();
    for (int count = 0; count < 2; ++count) EXPECT_EQ(notices_.next(*agent), "WATCHDOG=1");
}

// Which program another user's process runs, the agent may read with one capability alone. Nothing that it starts gets
// it.
TEST_F(ServiceManager, GivesTheCapabilityThatTellsOtherUsersPrograms) {
    if (getuid() != 0) GTEST_SKIP() << "takes two users: run it as root";
    constexpr const char* otherUser = "65534";
    place_.setMode("", 0755);
    std::filesystem::copy(VRX_PROGRAMS "/vrxagent", place_ / "app");
    std::filesystem::create_directory(place_ / "home");
    ASSERT_EQ(chown((place_ / "home").c_str(), 65534, 65534), 0);
    place_.setMode("notices", 0666);
    for (const bool isCapable : {false, true}) {
        Arguments words{"--reuid", otherUser, "--regid", otherUser, "--clear-groups"};
        if (isCapable) words.insert(words.end(), {"--inh-caps", "+sys_ptrace", "--ambient-caps", "+sys_ptrace"});
        words.insert(words.end(),
                     {place_ / "app/vrxagent", "--home", place_ / "home", "--socket", place_ / "home/socket"});
        const Process agent(place_.path(), "/usr/bin/setpriv", words, {notices_.variable()});
        ASSERT_EQ(notices_.next(agent), "READY=1") << agent.errors();
        const Place::Outcome outcome = place_.vrxctl({"device"}, "home/socket");
        EXPECT_EQ(outcome.code, isCapable ? 0 : 4) << outcome.errors;
        const std::string status = fileText("/proc/" + std::to_string(agent.identifier()) + "/status");
        EXPECT_NE(status.find("CapAmb:\t0000000000000000"), std::string::npos) << status;
    }
}

}  // namespace
}  // namespace vrx::end_to_end
