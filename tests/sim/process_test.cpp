// The simulated process: what its end takes, and when it ends by itself.
#include <gmock/gmock.h>

#include "sim/host.h"

namespace vrx::sim {
namespace {

using namespace std::chrono_literals;
using testing::ElementsAre;

class SimProcess : public testing::Test {
protected:
    void launch() {
        host.process.launch([this] {
            notes.push_back("started");
            host.notifications.registerForNotification("com.orvane.n", host.queues.mainQueue(),
                                                       [this] { notes.push_back("notified"); });
            return std::shared_ptr<void>(nullptr, [this](void*) { notes.push_back("gone"); });
        });
    }

    std::vector<std::string> notes;
    Host host;
};

TEST_F(SimProcess, TakesItsMemoryAlongWhenItEnds) {
    launch();
    host.defaults.set("stored", 1);
    host.defaults.registerDefaults({{"registered", 1}});
    auto worker = host.queues.makeSerialQueue("worker");
    worker->post([this] {
        std::shared_ptr<void> unwound(nullptr, [this](void*) { notes.push_back("unwound"); });
        host.queues.makeEvent()->wait();
    });
    worker->postAfter(1s, [this] { notes.push_back("never"); });
    host.notifications.raise(".n");
    host.run();
    host.notifications.raise(".n");  // delivered, but not yet taken
    host.process.restart();
    host.runFor(2s);
    EXPECT_THAT(notes, ElementsAre("started", "notified", "unwound", "gone", "started"));
    EXPECT_EQ(host.defaults.dictionaryRepresentation(), (platform::Dictionary{{"stored", 1}}));
    EXPECT_EQ(host.queues.waitingCount(), 0u);

    host.process.kill();
    host.notifications.raise(".n");
    host.process.relaunch();
    host.run();
    EXPECT_THAT(notes, testing::Contains("notified").Times(2)) << "what was missed is heard of";
}

TEST_F(SimProcess, ExitsOnceNothingIsUnderWay) {
    launch();
    platform::OnceCallback<platform::BackgroundActivityResult> result;
    host.activities.schedule({.identifier = "a"}, [&](auto completion) { result = std::move(completion); });
    host.runFor(1s);
    auto work = host.process.beginWork();
    host.process.exitCleanWhenIdle();
    host.runFor(1s);
    work.reset();
    host.runFor(1s);
    EXPECT_EQ(host.process.cleanExits(), 0) << "an activity is running";
    result(platform::BackgroundActivityResult::Finished);
    host.run();
    EXPECT_EQ(host.process.cleanExits(), 1);
    EXPECT_THAT(notes, ElementsAre("started", "gone", "started"));
    host.runFor(1h);
    EXPECT_EQ(host.process.cleanExits(), 1) << "the next one was not asked to";
}

TEST_F(SimProcess, NotifiesUntilCancelled) {
    int count = 0;
    auto token =
        host.notifications.registerForNotification("com.orvane.other", host.queues.mainQueue(), [&] { ++count; });
    EXPECT_NE(token, 0);
    host.notifications.raise(".other");
    host.run();
    host.notifications.raise(".other");
    host.notifications.cancel(token);
    host.notifications.cancel(token);
    host.run();
    EXPECT_EQ(count, 1);
}

}  // namespace
}  // namespace vrx::sim
