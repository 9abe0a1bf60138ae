// Every operation of the agent through the client library: what a real agent answers, and what a program learns when
// there is none, or none for it.
#include <gtest/gtest.h>
#include <sys/socket.h>

#include <array>
#include <csignal>
#include <filesystem>
#include <fstream>
#include <future>
#include <thread>

#include "end_to_end/programs.h"
#include "vrx/client/agent_connection.h"
#include "vrx/host/base/descriptor.h"

namespace vrx::end_to_end {
namespace {

using client::AgentConnection;
using client::Failure;
using platform::Dictionary;
using platform::Value;

template <class T>
std::optional<Failure> failureOf(const client::Answer<T>& answer) {
    return answer ? std::nullopt : std::optional(answer.failure());
}

using Operation = std::optional<Failure> (*)(AgentConnection&);
constexpr std::array<Operation, 10> operations{
    [](AgentConnection& agent) { return failureOf(agent.scheduleOutreachWithReply()); },
    [](AgentConnection& agent) { return failureOf(agent.checkIsAvailableInStore("a")); },
    [](AgentConnection& agent) { return failureOf(agent.appSupportAvailability("a")); },
    [](AgentConnection& agent) { return failureOf(agent.readWebURLOverride()); },
    [](AgentConnection& agent) { return failureOf(agent.defaultDevice()); },
    [](AgentConnection& agent) { return failureOf(agent.pairedDevices()); },
    [](AgentConnection& agent) { return failureOf(agent.getDefaultDeviceInfoUsingPolicy(1)); },
    [](AgentConnection& agent) { return failureOf(agent.getDeviceInfoForSerialNumber("A", 1)); },
    [](AgentConnection& agent) { return failureOf(agent.getAllDeviceInfosUsingPolicy(1, false)); },
    [](AgentConnection& agent) { return failureOf(agent.dismissFollowUpForSerialNumber("A")); }};

// What an operation replies later, on another thread.
template <class T, class Ask>
T replied(Ask ask) {
    std::promise<T> promise;
    ask([&](T answer) { promise.set_value(std::move(answer)); });
    return promise.get_future().get();
}

class Operations : public testing::Test {
protected:
    void start() {
        place_.start();
        ASSERT_TRUE(place_.isReady()) << place_.agent().errors();
    }
    // As a tester's profile lets a program be served that has no bundle.
    void entitleThisProgram() const {
        place_.write("device.toml", fileText(place_ / "device.toml") +
                                        "\n[[bundles]]\nidentifier = 'test'\nexecutables = ['" + program_ +
                                        "']\n[bundles.entitlements]\n'com.orvane.private.vrxagent' = true\n");
    }
    void expectAll(Failure::Kind kind, const std::string& named, double limit = 420) const {
        AgentConnection agent({.socketPath = place_ / "socket", .timeLimit = platform::Duration(limit)});
        for (std::size_t i = 0; i < operations.size(); ++i) {
            const std::optional<Failure> failure = operations[i](agent);
            ASSERT_TRUE(failure) << i;
            EXPECT_EQ(failure->kind, kind) << i << ": " << failure->text;
            EXPECT_NE(failure->text.find(named), std::string::npos) << i << ": " << failure->text;
        }
    }
    // Of the listener, and of the clients that have connected to it.
    std::ptrdiff_t socketsAtPath() const {
        std::ifstream sockets("/proc/net/unix");
        std::ptrdiff_t count = 0;
        for (std::string line; std::getline(sockets, line);) count += line.find(place_ / "socket") != line.npos;
        return count;
    }

    const std::string program_ = std::filesystem::read_symlink("/proc/self/exe");
    Place place_;
};

TEST_F(Operations, AnswerFromTheAgent) {
    entitleThisProgram();
    start();
    place_.useCoverageFiles();
    AgentConnection agent({.socketPath = place_ / "socket"});
    EXPECT_EQ((*agent.defaultDevice())->name(), "Maya's Phone");
    EXPECT_EQ(agent.pairedDevices()->at(1)->deviceType(), VRXDeviceTypeWatch);
    EXPECT_EQ(replied<DeviceList>([&](auto reply) { agent.pairedDevices(reply); }).size(), 2u);

    EXPECT_EQ((*agent.getDefaultDeviceInfoUsingPolicy(VRXWarrantyLookupPolicyCachedOnly))->warranty(), nullptr);
    const auto phone = *agent.getDefaultDeviceInfoUsingPolicy(VRXWarrantyLookupPolicyRefresh);
    EXPECT_EQ(phone->warranty()->coverageLocalizedLabel(), Value("Limited Warranty"));
    const auto watch = *agent.getDeviceInfoForSerialNumber("VRXWATCH0001", VRXWarrantyLookupPolicyDefault);
    EXPECT_EQ(watch->device()->name(), "Maya's Watch");
    EXPECT_EQ(watch->warranty()->coverageLocalizedLabel(), Value("QX Coverage for Watch"));
    const auto cached = replied<std::shared_ptr<VRXDeviceInfo>>([&](auto reply) {
        agent.getDeviceInfoForSerialNumber("VRXWATCH0001", VRXWarrantyLookupPolicyCachedOnly, reply);
    });
    EXPECT_EQ(cached->warranty()->dictionaryRepresentation(), watch->warranty()->dictionaryRepresentation());
    EXPECT_EQ((*agent.getDeviceInfoForSerialNumber("A", 1))->device()->name(), "<unknown>");
    const DeviceInfoList all = *agent.getAllDeviceInfosUsingPolicy(VRXWarrantyLookupPolicyDefault, true);
    EXPECT_EQ(all.size(), 3u);
    for (const auto& info : all) EXPECT_TRUE(info->warranty()->covered());

    EXPECT_TRUE(*agent.dismissFollowUpForSerialNumber("VRXWATCH0001"));
    const char* dismissed = "FollowupDismissedSerialNumberHashes";
    EXPECT_EQ(place_.vrxhost({"defaults", "read", dismissed, "--json"}).document["value"].asArray()->size(), 1u);
    EXPECT_TRUE(*agent.scheduleOutreachWithReply());
    EXPECT_TRUE(replied<bool>([&](auto reply) { agent.scheduleOutreachWithReply(reply); }));
    EXPECT_EQ(*agent.readWebURLOverride(), std::nullopt);
    // Without a store the one tells nothing, and the other what was asked for.
    EXPECT_TRUE(agent.checkIsAvailableInStore("com.example")->isNull());
    EXPECT_EQ(*agent.appSupportAvailability("com.example"), Value(Dictionary{{"AppBundleID", "com.example"}}));
}

TEST_F(Operations, TimeOut) {
    const SilentServer silent(place_ / "socket");
    expectAll(Failure::Kind::TimedOut, "in time", 0.05);
    // Nor when no place comes free in its queue.
    const sockaddr_un address = addressOf(place_ / "socket");
    std::vector<host::Descriptor> clients;
    do {
        clients.emplace_back(socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC | SOCK_NONBLOCK, 0));
    } while (connect(clients.back().number(), reinterpret_cast<const sockaddr*>(&address), sizeof address) == 0);
    expectAll(Failure::Kind::TimedOut, "timed out", 0.05);
}

TEST_F(Operations, AreRefusedToProgramsWithoutTheEntitlement) {
    start();
    expectAll(Failure::Kind::Refused, program_ + " does not hold the entitlement com.orvane.private.vrxagent");
}

TEST_F(Operations, EndWithTheAgent) {
    entitleThisProgram();
    expectAll(Failure::Kind::NotReachable, place_ / "socket");
    start();
    // Killed, with a call of each operation under way: it has come to the agent and is not answered.
    place_.agent().signal(SIGSTOP);
    const std::ptrdiff_t before = socketsAtPath();
    AgentConnection agent({.socketPath = place_ / "socket", .connections = operations.size()});
    std::vector<std::future<std::optional<Failure>>> calls;
    for (const Operation ask : operations) calls.push_back(std::async(std::launch::async, ask, std::ref(agent)));
    while (socketsAtPath() < before + std::ssize(operations)) std::this_thread::yield();
    place_.agent().signal(SIGKILL);
    for (auto& call : calls) EXPECT_EQ(call.get()->kind, Failure::Kind::NotReachable);
    expectAll(Failure::Kind::NotReachable, place_ / "socket");
}

}  // namespace
}  // namespace vrx::end_to_end
