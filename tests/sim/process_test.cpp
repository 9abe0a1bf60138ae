// The simulated process: what its end takes, and when it ends by itself.
#include "vrx/sim/host.h"

#include "support/values.h"

namespace vrx::sim {
namespace {

class SimProcess : public testing::Test {
protected:
    void launch() {
        host.process.launch([this] {
            host.notifications.registerForNotification("com.orvane.n", host.queues.mainQueue(), note("notified"));
            return std::shared_ptr<void>(nullptr, [gone = note("gone")](void*) { gone(); });
        });
    }
    std::function<void()> note(const char* text) {
        return [this, text] { notes.push_back(text); };
    }

    std::vector<std::string> notes;
    Host host;
};

TEST_F(SimProcess, TakesItsMemoryAlongWhenItEnds) {
    launch();
    host.defaults.set("stored", 1);
    host.defaults.registerDefaults({{"registered", 1}});
    auto& worker = host.queues.workers(platform::Priority::Background);
    worker.post([this] {
        std::shared_ptr<void> unwound(nullptr, [this](void*) { notes.push_back("unwound"); });
        host.queues.makeEvent()->wait();
    });
    worker.postAfter(1s, note("never"));
    host.notifications.raise(".n");
    host.run();
    host.notifications.raise(".n");  // delivered, but not yet taken
    host.process.kill();
    host.runFor(2s);
    EXPECT_THAT(notes, ElementsAre("notified", "unwound", "gone"));
    EXPECT_EQ(host.defaults.dictionaryRepresentation(), (Dictionary{{"stored", 1}}));
    host.notifications.raise(".n");
    host.process.relaunch();
    host.run();
    EXPECT_EQ(notes.back(), "notified") << "what was missed is heard of";
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
    host.runFor(1h);
    EXPECT_EQ(host.process.cleanExits(), 1) << "the next one was not asked to";
    EXPECT_THAT(notes, ElementsAre("gone"));
}

}  // namespace
}  // namespace vrx::sim
