#include "vrx/client/agent_connection.h"

#include "client/fake_service.h"
#include "client/raw_client.h"

namespace vrx::test {
namespace {

using client::AgentConnection;
using client::Failure;

using AgentConnectionTest = WithFakeAgent;

TEST_F(AgentConnectionTest, AsksEveryOperationAndWaits) {
    agent->record =
        Dictionary{{"covered", true}, {"", "empty key"}, {"$class", "VRXDevice"}, {"$$", Dictionary{{"$date", 5}}}};
    AgentConnection connection(options());

    EXPECT_TRUE(*connection.scheduleOutreachWithReply());
    EXPECT_EQ(*connection.checkIsAvailableInStore("com.example"), Value(Dictionary{{"price", 0.5}, {"$id", 7}}));
    EXPECT_TRUE(connection.appSupportAvailability("com.example")->isNull());
    EXPECT_EQ(*connection.readWebURLOverride(), "https://web.example");
    auto device = *connection.defaultDevice();
    EXPECT_EQ(device->name(), "Phone");
    EXPECT_EQ(device->activationDate(), agent->device->activationDate());
    EXPECT_EQ(connection.pairedDevices()->at(1)->name(), std::nullopt);
    EXPECT_EQ((*connection.getDefaultDeviceInfoUsingPolicy(VRXWarrantyLookupPolicyRefresh))->device()->serialNumber(),
              "SN1");
    auto info = *connection.getDeviceInfoForSerialNumber("SN7", 77);
    EXPECT_EQ(info->warranty()->dictionaryRepresentation(), agent->record);
    EXPECT_TRUE(info->warranty()->covered());
    EXPECT_EQ(connection.getAllDeviceInfosUsingPolicy(VRXWarrantyLookupPolicyCachedOnly, true)->size(), 2u);
    EXPECT_TRUE(*connection.dismissFollowUpForSerialNumber("SN1"));
    EXPECT_THAT(connection.surroundings()->activities,
                ElementsAre(client::Activity{"a", "scheduled", platform::dateFromEpoch(8)}));
    EXPECT_EQ(*connection.status(), Value(Dictionary()));
    EXPECT_THAT(agent->requests(), ElementsAre("outreach", "store com.example", "support com.example", "url", "device",
                                               "paired", "info 2", "info SN7 77", "all 1 update", "dismiss SN1"));
}

TEST_F(AgentConnectionTest, AnswersLaterOnAThreadOfItsOwn) {
    std::atomic<int> answers = 0;
    {
        AgentConnection remote({.socketPath = service->socketPath(), .connections = 3});
        Signal done;
        auto count = [&](const auto& answer) {
            EXPECT_TRUE(answer) << answer.failure().text;
            if (++answers == 8) done.set();
        };
        remote.scheduleOutreachWithReply(count);
        remote.checkIsAvailableInStore("x", count);
        remote.appSupportAvailability("x", count);
        remote.defaultDevice(count);
        remote.pairedDevices(count);
        remote.getDefaultDeviceInfoUsingPolicy(0, count);
        remote.getDeviceInfoForSerialNumber("SN1", 0, count);
        remote.getAllDeviceInfosUsingPolicy(0, false, count);
        done.wait();
        remote.readWebURLOverride(nullptr);
        remote.dismissFollowUpForSerialNumber("SN1", [&](auto) { ++answers; });
    }
    EXPECT_EQ(answers, 9);
}

TEST_F(AgentConnectionTest, CancelsOneCallAndNoOther) {
    holdOutreach();
    AgentConnection connection({.socketPath = service->socketPath(), .connections = 2});
    Signal isCancelled, isAnswered;
    const auto expectCancelled = [&](const client::Answer<bool>& answer) {
        EXPECT_EQ(answer.failure().kind, Failure::Kind::Cancelled);
        isCancelled.set();
    };
    const client::Call call = connection.scheduleOutreachWithReply(expectCancelled);
    connection.scheduleOutreachWithReply([&](const client::Answer<bool>& answer) {
        EXPECT_TRUE(answer);
        isAnswered.set();
    });
    awaitHeld(2);
    const client::Call waiting = connection.scheduleOutreachWithReply(expectCancelled);
    call.cancel();
    isCancelled.wait();
    waiting.cancel();
    isCancelled.wait();
    answerHeld();
    isAnswered.wait();
    call.cancel();  // it is over
    EXPECT_TRUE(connection.defaultDevice());
}

TEST_F(AgentConnectionTest, TellsWhyThereIsNoAnswer) {
    holdOutreach();
    agent->onStore = [](std::string, VRXAgentProtocol::Reply<Value> reply) { reply("no dictionary"); };

    AgentConnection connection(options());
    EXPECT_EQ(connection.checkIsAvailableInStore("x").failure().kind, Failure::Kind::BadReply);
    EXPECT_EQ(connection.dismissFollowUpForSerialNumber(std::string("S\0N", 3)).failure().kind, Failure::Kind::Refused);
    auto tooLong = connection.dismissFollowUpForSerialNumber(std::string(1 << 13, 'x'));
    EXPECT_EQ(tooLong.failure().kind, Failure::Kind::Refused);
    EXPECT_EQ(tooLong.failure().refusal, Failure::Refusal::Argument);
    EXPECT_THAT(tooLong.failure().text, HasSubstr("longer than 1024"));

    AgentConnection hasty({.socketPath = service->socketPath(), .timeLimit = Duration(0.05)});
    do {  // on a busy machine the limit may pass before anything is sent
        EXPECT_EQ(hasty.scheduleOutreachWithReply().failure().kind, Failure::Kind::TimedOut);
    } while (held == 0);
    answerHeld();  // late, and for nobody
    EXPECT_TRUE(*connection.defaultDevice());

    // Nor does a call come through where nobody is accepted and the queue is full.
    host::TemporaryFolder folder;
    host::ListeningSocket full;
    ASSERT_FALSE(full.open(folder / "socket"));
    ASSERT_EQ(listen(full.number(), 0), 0);
    const RawClient first(folder / "socket");
    AgentConnection late({.socketPath = folder / "socket", .timeLimit = Duration(0.05)});
    const Failure failure = late.scheduleOutreachWithReply().failure();
    EXPECT_EQ(failure.kind, Failure::Kind::TimedOut);
    EXPECT_THAT(failure.text, HasSubstr("timed out"));

    AgentConnection nobody({.socketPath = "/nowhere/socket"});
    Signal isDone;
    nobody.pairedDevices([&](const client::Answer<DeviceList>& answer) {
        EXPECT_EQ(answer.failure().kind, Failure::Kind::NotReachable) << "and no empty list";
        EXPECT_THAT(answer.failure().text, HasSubstr("/nowhere/socket"));
        isDone.set();
    });
    isDone.wait();
}

TEST_F(AgentConnectionTest, TellsItsUserWhatTheAgentSaidOfARefusal) {
    serve({}, false);
    AgentConnection connection(options());
    for (int i = 0; i < 3; ++i) {
        auto answer = connection.defaultDevice();
        ASSERT_FALSE(answer);
        EXPECT_EQ(answer.failure().kind, Failure::Kind::Refused);
        EXPECT_EQ(answer.failure().refusal, Failure::Refusal::Entitlement);
        EXPECT_THAT(answer.failure().text, HasSubstr("client_tests does not hold the entitlement test.entitlement"));
    }
    serve({.connections = 1});
    AgentConnection served(options()), tooMany(options());
    EXPECT_TRUE(served.defaultDevice());
    EXPECT_EQ(tooMany.defaultDevice().failure().refusal, Failure::Refusal::Limit);
}

TEST_F(AgentConnectionTest, AsksAgainOnceWhenTheAgentEnded) {
    AgentConnection connection(options());
    ASSERT_TRUE(connection.defaultDevice());
    service->stop();
    service->start();
    EXPECT_TRUE(connection.defaultDevice()) << "the kept connection has ended";

    // The agent ends while it owes a reply: once, and then each time.
    std::atomic<bool> answersSecond = true;
    agent->onOutreach = [&](Outreach reply) {
        if (answersSecond && held == 1) return reply(true);
        hold(std::move(reply));
    };
    auto restartAtRequest = [&](int number) {
        awaitHeld(number);
        service->restart();
    };
    std::thread once(restartAtRequest, 1);
    auto answer = connection.scheduleOutreachWithReply();
    EXPECT_TRUE(answer) << answer.failure().text;
    once.join();

    answersSecond = false;
    std::thread twice([&] {
        restartAtRequest(2);
        restartAtRequest(3);
    });
    EXPECT_EQ(connection.scheduleOutreachWithReply().failure().kind, Failure::Kind::NotReachable);
    twice.join();
    EXPECT_EQ(held, 3) << "not a third time";
    answerHeld();
}

TEST_F(AgentConnectionTest, KeepsTheAgentFromEndingWithARequestAndNotWithSilence) {
    AgentConnection silent(options()), asking(options());
    ASSERT_TRUE(silent.defaultDevice());

    holdOutreach();
    Signal isAnswered;
    asking.scheduleOutreachWithReply([&](const client::Answer<bool>& answer) {
        EXPECT_TRUE(answer);
        isAnswered.set();
    });
    awaitHeld();
    service->exitCleanWhenIdle();
    EXPECT_TRUE(silent.defaultDevice()) << "others are served meanwhile";
    EXPECT_EQ(service->ends(), 0);
    answerHeld();
    service->waitForEnd(1);
    isAnswered.wait();
    EXPECT_TRUE(silent.defaultDevice()) << "asked again, of the next";
    EXPECT_EQ(service->ends(), 1);
}

TEST_F(AgentConnectionTest, EndsItsCallsWhenItGoes) {
    holdOutreach();
    std::atomic<int> failures = 0;
    {
        AgentConnection connection({.socketPath = service->socketPath(), .connections = 1});
        const auto count = [&](const auto& answer) {
            failures += !answer && answer.failure().kind == Failure::Kind::NotReachable;
        };
        connection.scheduleOutreachWithReply(count);
        connection.defaultDevice(count);
        awaitHeld();
    }
    EXPECT_EQ(failures, 2);
    answerHeld();
}

TEST_F(AgentConnectionTest, GivesRecordsTheirDerivedTextsWithoutAPlatform) {
    platform::Platform* before = platform::Platform::hasCurrent() ? &platform::Platform::current() : nullptr;
    platform::Platform::setCurrent(nullptr);
    AgentConnection connection(options());
    const double inThreeDays =
        std::chrono::duration<double>(std::chrono::system_clock::now().time_since_epoch()).count() + 2.5 * 86400;
    auto record = VRXWarranty::initWithDictionary(
        Dictionary{{"qxOfferEligibleUntil", inThreeDays}, {"qxLocalizedOfferPluralDescFormat", "%@ days"}});
    EXPECT_EQ(record->daysEligible(), 3u);
    EXPECT_EQ(record->qxLocalizedOfferDesc(), Value("3 days"));
    // And by the agent's day and locale, once they are known.
    AgentConnection::deriveAs(*connection.surroundings());
    EXPECT_EQ(record->daysEligible(), 3600u);
    EXPECT_EQ(record->qxLocalizedOfferDesc(), Value("3.600 days"));
    AgentConnection::deriveAs({.locale = "en_US"});
    platform::Platform::setCurrent(before);
}

}  // namespace
}  // namespace vrx::test
