// The agent as a process: what it keeps over restarts, and what it makes of damage.
#include <gtest/gtest.h>

#include <sys/socket.h>
#include <unistd.h>

#include <csignal>
#include <filesystem>

#include "end_to_end/programs.h"

namespace vrx::end_to_end {
namespace {

using platform::Value;
using testing::Test;

class Agent : public Test {
protected:
    void SetUp() override {
        place_.start();
        ASSERT_TRUE(place_.isReady()) << place_.agent().errors();
        place_.useCoverageFiles();
    }

    Place::Outcome info(const std::string& policy) { return place_.vrxctl({"info", "--json", "--policy", policy}); }

    Place place_;
};

class AgentEnd : public Agent, public testing::WithParamInterface<int> {};

TEST_P(AgentEnd, LeavesTheCachedRecordToTheNextStart) {
    const Place::Outcome refreshed = info("refresh");
    ASSERT_EQ(refreshed.code, 0) << refreshed.errors;

    place_.agent().signal(GetParam());
    EXPECT_EQ(place_.agent().wait(), GetParam() == SIGKILL ? -SIGKILL : 0) << place_.agent().errors();
    std::filesystem::remove(place_ / "coverage/Warranty.plist");
    place_.start();
    ASSERT_TRUE(place_.isReady()) << place_.agent().errors();

    EXPECT_EQ(info("refresh").code, 1);
    for (const char* policy : {"cached", "default"}) {
        const Place::Outcome cached = info(policy);
        EXPECT_EQ(cached.code, 0) << cached.errors;
        EXPECT_EQ(cached.document["coverage"], refreshed.document["coverage"]);
    }
    EXPECT_EQ(place_.stop(), 0) << place_.agent().errors();
}

INSTANTIATE_TEST_SUITE_P(Signals, AgentEnd, testing::Values(SIGTERM, SIGINT, SIGKILL),
                         [](const auto& signal) { return std::string(sigabbrev_np(signal.param)); });

TEST_F(Agent, TakesADamagedCacheFileForAbsent) {
    ASSERT_EQ(info("refresh").code, 0);
    const Value path = place_.vrxhost({"cache", "VRXPHONE0001", "--json"}).document["path"];
    std::filesystem::resize_file(*path.asString(), std::filesystem::file_size(*path.asString()) / 2);

    EXPECT_EQ(place_.vrxhost({"cache", "VRXPHONE0001", "--json"}).document["error"]["kind"], Value("damaged"));
    EXPECT_EQ(info("cached").code, 1);
    EXPECT_EQ(info("default").code, 0);
    EXPECT_EQ(info("cached").code, 0);
}

TEST_F(Agent, KeepsItsRecordWhenTheNewOneIsNone) {
    const Value record = info("refresh").document["coverage"];
    for (const char* document :
         {"<plist version='1.0'><array/></plist>", "<plist version='1.0'><dict>", "{\"covered\": null}"}) {
        place_.write("coverage/Warranty.plist", document);
        EXPECT_EQ(info("refresh").code, 1) << document;
        EXPECT_EQ(info("cached").document["coverage"], record) << document;
    }
    // Values of other types than expected make a record, without what they should have said.
    place_.write("coverage/Warranty.plist",
                 "<plist version='1.0'><dict><key>qxOfferEligibleUntil</key><string>soon</string>"
                 "<key>coverage</key><true/><key>featureToggleParameters</key><array/></dict></plist>");
    const Value odd = info("refresh").document;
    EXPECT_EQ(odd["coverage"]["coverage"], Value(true));
    EXPECT_EQ(odd["derived"]["daysEligible"], Value(0));
}

TEST_F(Agent, SetsADamagedDatabaseAside) {
    ASSERT_EQ(place_.stop(), 0);
    std::filesystem::remove(place_ / "home/host.db-wal");
    const std::string damaged(8192, 'x');
    place_.write("home/host.db", damaged);
    place_.start();
    ASSERT_TRUE(place_.isReady()) << place_.agent().errors();
    EXPECT_EQ(place_.vrxctl({"device"}).code, 0);
    std::size_t kept = 0;
    for (const auto& entry : std::filesystem::directory_iterator(place_ / "home"))
        if (entry.is_regular_file()) kept += fileText(entry.path()) == damaged;
    EXPECT_EQ(kept, 1u);
}

TEST_F(Agent, KeepsTheLastGoodProfileAndStartsWithoutOne) {
    place_.write("device.toml", "[device]\nserial_number = ");  // before anybody asked
    EXPECT_EQ(place_.vrxctl({"device", "--json"}).document["device"]["serialNumber"], Value("VRXPHONE0001"));
    ASSERT_EQ(place_.stop(), 0);
    place_.start();
    ASSERT_TRUE(place_.isReady()) << place_.agent().errors();
    const Place::Outcome device = place_.vrxctl({"device", "--json"});
    EXPECT_EQ(device.code, 0);
    EXPECT_NE(device.document["device"]["serialNumber"], Value("VRXPHONE0001"));
    EXPECT_EQ(place_.stop(), 0);
    EXPECT_NE(place_.agent().errors().find("device.toml:2: "), std::string::npos) << place_.agent().errors();
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
}

TEST_F(Agent, EndsWhileARequestIsUnderWay) {
    const SilentServer server;
    ASSERT_EQ(place_.vrxhost({"defaults", "write", "ServerVersionURL", "--string", server.url()}).code, 0);

    Process client(place_ / "", place_ / "app/vrxctl", {"--socket", place_ / "socket", "info", "--policy", "refresh"});
    const int connection = accept(server.file(), nullptr, nullptr);
    EXPECT_EQ(place_.stop(), 0) << place_.agent().errors();
    EXPECT_EQ(client.wait(), 3) << client.errors();
    close(connection);
}

}  // namespace
}  // namespace vrx::end_to_end
