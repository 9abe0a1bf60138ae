// Callbacks that are called exactly once, and groups of work.
#include "vrx/platform/task.h"

#include <stdexcept>

#include "support/values.h"
#include "vrx/platform/completion_group.h"

namespace vrx::platform {
namespace {

// The once-only rule is checked where assertions are compiled in.
bool areAssertionsOn() {
    bool on = false;
    assert(on = true);
    return on;
}

TEST(OnceCallback, TakesMoveOnlyThingsAndIsSpentByItsCall) {
    int sum = 0;
    OnceCallback<int> callback([&sum, held = std::make_unique<int>(1)](int number) { sum += *held + number; });
    OnceCallback<int> moved = std::move(callback);
    EXPECT_FALSE(callback);  // NOLINT: a callback that was moved away is none
    moved(2);
    EXPECT_EQ(sum, 3);
    EXPECT_FALSE(moved);
    bool wasSpent = false;
    moved = OnceCallback<int>([&](int) { wasSpent = !moved; });
    moved(0);
    EXPECT_TRUE(wasSpent) << "before it ran";
}

TEST(OnceCallback, MayBeDroppedWhenLetGoAtShutdownOrWhileAnExceptionPasses) {
    OnceCallback<>([] {}).letGo();
    {
        ShutdownScope shutdown;
        OnceCallback<> dropped([] {});
    }
    EXPECT_FALSE(ShutdownScope::isActive());
    try {
        OnceCallback<> dropped([] {});
        throw std::runtime_error("passes");
    } catch (const std::runtime_error&) {
    }
    OnceCallback<> none = nullptr;
    OnceCallback<> replaced([] {});
    replaced.letGo();
    replaced = OnceCallback<>(nullptr);
}

TEST(OnceCallbackDeathTest, StopsOnASecondCallAndOnOneDroppedUnanswered) {
    if (!areAssertionsOn()) GTEST_SKIP() << "built without assertions";
    OnceCallback<> spent([] {});
    spent();
    EXPECT_DEATH(spent(), "a second time");
    EXPECT_DEATH({ OnceCallback<> dropped([] {}); }, "dropped unanswered");
    EXPECT_DEATH(
        {
            OnceCallback<> replaced([] {});
            replaced = OnceCallback<>([] {});
        },
        "dropped unanswered");
}

// Keeps what is posted until it is told to run it.
class ManualQueue final : public Queue {
public:
    void post(Task task) override { tasks_.push_back(std::move(task)); }
    void postAfter(Duration, Task task) override { post(std::move(task)); }
    void run() {
        for (Task& task : std::exchange(tasks_, {})) task();
    }

private:
    std::vector<Task> tasks_;
};

class CompletionGroupTest : public testing::Test {
protected:
    void notify(const char* name) {
        group.notify(queue, [this, name] { notes.push_back(name); });
    }
    std::vector<std::string> notesAfterRun() {
        queue->run();
        return std::exchange(notes, {});
    }

    std::shared_ptr<ManualQueue> queue = std::make_shared<ManualQueue>();
    std::vector<std::string> notes;
    CompletionGroup group;
};

TEST_F(CompletionGroupTest, NotifiesOnTheQueueOnceNothingIsUnderWay) {
    notify("empty");
    EXPECT_THAT(notes, ElementsAre()) << "never on the spot";
    EXPECT_THAT(notesAfterRun(), ElementsAre("empty"));

    group.enter();
    group.enter();
    notify("first");
    group.leave();
    notify("second");
    EXPECT_THAT(notesAfterRun(), ElementsAre());
    group.leave();
    EXPECT_THAT(notesAfterRun(), ElementsAre("first", "second"));

    group.enter();
    group.leave();
    EXPECT_THAT(notesAfterRun(), ElementsAre()) << "notified once only";
}

}  // namespace
}  // namespace vrx::platform
