// The agent as a process: what it keeps over restarts, and what it makes of damage.
#include <algorithm>
#include <csignal>

#include "end_to_end/programs.h"
#include "host/http/loopback_server.h"
#include "support/eventually.h"
#include "vrx/host/home/database.h"

namespace vrx::end_to_end {
namespace {

class Agent : public AtPlace {
protected:
    void SetUp() override { start(); }

    Place::Outcome info(const std::string& policy) { return place_.vrxctl({"info", "--json", "--policy", policy}); }
};

// By a signal.
class AgentEnd : public Agent, public testing::WithParamInterface<int> {
protected:
    void end() {
        place_.agent().signal(GetParam());
        EXPECT_EQ(place_.agent().wait(), GetParam() == SIGKILL ? -SIGKILL : 0) << place_.agent().errors();
    }
};

TEST_P(AgentEnd, LeavesTheCachedRecordToTheNextStart) {
    const Place::Outcome refreshed = info("refresh");
    ASSERT_EQ(refreshed.code, 0) << refreshed.errors;

    end();
    std::filesystem::remove(place_ / "coverage/Warranty.plist");
    place_.start();

    EXPECT_EQ(info("refresh").code, 1);
    for (const char* policy : {"cached", "default"}) {
        const Place::Outcome cached = info(policy);
        EXPECT_EQ(cached.code, 0) << cached.errors;
        EXPECT_EQ(cached.document["coverage"], refreshed.document["coverage"]);
    }
    EXPECT_EQ(place_.stop(), 0) << place_.agent().errors();
}

TEST_P(AgentEnd, EndsTheRequestUnderWay) {
    const host::LoopbackServer silent([](const auto&) { return ""; });
    ASSERT_EQ(place_.vrxhost({"defaults", "write", "ServerVersionURL", "--string", silent.url()}).code, 0);
    Process client(place_.path(), place_ / "app/vrxctl",
                   {"--socket", place_ / "socket", "info", "--policy", "refresh"});
    eventually([&] { return silent.connections() >= 1; }, "the agent's download");
    end();
    EXPECT_EQ(client.wait(), 3) << client.errors();
}

INSTANTIATE_TEST_SUITE_P(Signals, AgentEnd, testing::Values(SIGTERM, SIGINT, SIGKILL),
                         [](const auto& signal) { return std::string(sigabbrev_np(signal.param)); });

TEST_F(AtPlace, TakesTheServerFromTheProfileUntilOneIsWritten) {
    const std::string profile = fileText(place_ / "device.toml") + "\n[defaults]\n";
    const auto preset = [&](const std::string& key, const std::string& file) {
        return key + " = 'file://" + place_ / ("coverage/" + file) + "'\n";
    };
    const auto refresh = [this] {
        return place_.vrxctl({"info", "--json", "--policy", "refresh"}).document["coverage"]["coverageLocalizedLabel"];
    };
    const auto source = [this](const std::string& key) {
        return place_.vrxhost({"defaults", "read", key, "--json"}).document["source"];
    };
    place_.write("device.toml", profile + preset("ServerVersionURL", "ServerVersion.plist") +
                                    preset("WarrantyURL", "Warranty.VRXWATCH0001.plist"));
    place_.start();
    EXPECT_EQ(refresh(), Value("QX Coverage for Watch"));
    const auto lines = std::count(profile.begin(), profile.end(), '\n');
    EXPECT_EQ(source("WarrantyURL"), Value(place_ / "device.toml:" + std::to_string(lines + 2)));
    EXPECT_EQ(source("OneDayInterval"), Value("the agent's own"));
    place_.write("device.toml",
                 profile + preset("ServerVersionURL", "ServerVersion.plist") + preset("WarrantyURL", "Warranty.plist"));
    EXPECT_NE(refresh(), Value("QX Coverage for Watch")) << "without a restart";
    place_.useCoverageFiles();
    EXPECT_EQ(source("WarrantyURL"), Value("written"));
    EXPECT_EQ(place_.stop(), 0) << place_.agent().errors();
}

TEST_F(Agent, IsAloneInItsHomeAndAtItsSocket) {
    const auto second = [&](const std::string& home, const std::string& socket) {
        return place_.run(VRX_PROGRAMS "/vrxagent", {"--home", place_ / home, "--socket", place_ / socket});
    };
    const Place::Outcome sameHome = second("home", "other-socket");
    EXPECT_EQ(sameHome.code, 1);
    EXPECT_NE(sameHome.errors.find("another agent"), std::string::npos) << sameHome.errors;
    EXPECT_EQ(second("other-home", "socket").code, 1);
    EXPECT_EQ(place_.vrxctl({"device"}).code, 0);

    std::filesystem::remove_all(place_ / "home");  // and so another agent could take it
    EXPECT_EQ(place_.agent().wait(), 0) << "it is to begin anew";
    EXPECT_NE(place_.agent().errors().find("was taken away"), std::string::npos) << place_.agent().errors();
}

TEST_F(Agent, AnswersWhileAnotherProcessWrites) {
    host::LogRecorder log;
    host::Database other(place_ / "home/host.db");
    EXPECT_FALSE(other.write([&](host::Connection&) {
        place_.write("device.toml", fileText(place_ / "device.toml") + "\n[[watches]]\nserial_number = 'NEW'\n");
        for (int i = 0; i < 10; ++i) EXPECT_EQ(place_.vrxctl({"device", "--timeout", "4"}).code, 0);
    }));
    const auto isTold = [&] {
        return place_.agent().errors().find("_pairedOrActiveDevicesDidChange") != std::string::npos;
    };
    eventually(isTold, "what the agent could not store at first");
    EXPECT_EQ(place_.stop(), 0);
}

}  // namespace
}  // namespace vrx::end_to_end
