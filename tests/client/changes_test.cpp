// Follow-ups and changes, over the host's real listener.
#include "vrx/client/changes.h"

#include <gmock/gmock.h>

#include <mutex>

#include "client/fake_service.h"
#include "client/raw_client.h"
#include "vrx/client/follow_ups.h"

namespace vrx::test {
namespace {

using client::Change;
using client::Changes;
using client::Failure;
using ::testing::ElementsAre;

// What was told, one change after the other.
class Told {
public:
    Changes::Handler handler() {
        return [this](const Change& change) {
            std::lock_guard lock(mutex_);
            changes_.push_back(
                change.failure ? "failure" : std::string(change.followUps ? "f" : "") + (change.coverage ? "c" : ""));
        };
    }
    std::vector<std::string> await(std::size_t count) {
        eventually([&] { return all().size() >= count; }, "a change");
        return all();
    }
    std::vector<std::string> all() {
        std::lock_guard lock(mutex_);
        return changes_;
    }

private:
    std::mutex mutex_;
    std::vector<std::string> changes_;
};

using ChangesTest = WithFakeAgent;

TEST_F(ChangesTest, AreToldAfterTheSubscriptionAndAgainAfterTheAgentsRestart) {
    Told told;
    const Changes changes(told.handler(), options());
    EXPECT_THAT(told.await(1), ElementsAre("fc")) << "something may have changed before";
    service->host.changes.note(host::Changes::followUps);
    EXPECT_THAT(told.await(2), ElementsAre("fc", "f"));
    service->restart();
    EXPECT_THAT(told.await(3), ElementsAre("fc", "f", "fc"));
    service->host.changes.note(host::Changes::coverage);
    EXPECT_THAT(told.await(4), ElementsAre("fc", "f", "fc", "c"));

    Told ofNobody;
    const Changes none(ofNobody.handler(), {.socketPath = "/nowhere/socket"});
    EXPECT_THAT(ofNobody.await(1), ElementsAre("failure"));
}

TEST_F(ChangesTest, AreNoWorkAndTakeASeatOnlyWhileNobodyElseNeedsIt) {
    serve({.connections = 2});
    Told told;
    const Changes changes(told.handler(), options());
    told.await(1);
    client::AgentConnection idle(options()), other(options());
    ASSERT_TRUE(idle.defaultDevice());
    ASSERT_FALSE(other.defaultDevice()) << "of one user alone nobody gives a seat up";
    service->exitCleanWhenIdle();
    service->waitForEnd(1);  // although somebody is subscribed
    told.await(2);
}

// One that does not read loses signals, and costs no memory.
TEST_F(ChangesTest, AreJoinedForASlowSubscriber) {
    RawClient slow(service->socketPath());
    slow.write(RawClient::authentication() +
               RawClient::call(wire::subscribeMember, 1, "", "", wire::followUpsInterface));
    ASSERT_TRUE(slow.readUntil("root"));
    constexpr std::size_t notes = 100'000;
    for (std::size_t i = 0; i < notes; ++i) service->host.changes.note(host::Changes::followUps);
    slow.write(RawClient::call("readWebURLOverride", 2));
    ASSERT_TRUE(slow.readUntil("https://"));
    const std::string signal = "Changed";
    std::size_t told = 0;
    for (std::size_t at = 0; (at = slow.received().find(signal, at)) != std::string::npos; ++at) ++told;
    EXPECT_GE(told, 1u);
    EXPECT_LT(told, notes / 4);
}

TEST_F(ChangesTest, HaveTheirLimitForEachUser) {
    std::vector<std::shared_ptr<void>> taken;
    for (std::size_t i = 0; i < host::Changes::mostOfOneUser; ++i)
        taken.push_back(service->host.changes.subscribe(getuid(), [](host::Changes::Kinds) {}));
    EXPECT_TRUE(service->host.changes.subscribe(getuid() + 1, [](host::Changes::Kinds) {}));
    Told told;
    const Changes changes(told.handler(), options());
    EXPECT_THAT(told.await(1), ElementsAre("failure"));
}

TEST_F(ChangesTest, OfFollowUpsAreAskedForAndMade) {
    service->host.followUps =
        Array{Dictionary{{"identifier", "present"},
                         {"serialNumber", "SN1"},
                         {"title", "Add Coverage"},
                         {"text", "7 days left"},
                         {"badge", true},
                         {"daysLeft", 7},
                         {"nextTextChange", dateFromEpoch(5)},
                         {"actions", Array{Dictionary{{"label", "Buy"}}, Dictionary{{"url", "https://example.com"}}}}},
              Dictionary{{"title", "without an identifier"}}};
    client::FollowUps followUps(options());
    const auto pending = followUps.pending();
    ASSERT_TRUE(pending) << pending.failure().text;
    EXPECT_THAT(*pending, ElementsAre(client::FollowUp{.identifier = "present",
                                                       .serialNumber = "SN1",
                                                       .title = "Add Coverage",
                                                       .text = "7 days left",
                                                       .hasBadge = true,
                                                       .daysLeft = 7,
                                                       .nextTextChange = dateFromEpoch(5),
                                                       .actions = {{.label = "Buy"}, {.url = "https://example.com"}}}));
    EXPECT_TRUE(*followUps.dismiss("present"));
    EXPECT_FALSE(*followUps.dismiss("gone"));
    service->host.followUps = nullptr;
    EXPECT_EQ(followUps.pending().failure().kind, Failure::Kind::BadReply) << "and no empty list";
}

}  // namespace
}  // namespace vrx::test
