// The scheduler: what it registers with the system, and what a firing does.
#include "vrx/scheduling/scheduler.h"

#include "support/simulated_host.h"

namespace vrx {
namespace {

using platform::ActivityCriteria;
using platform::BackgroundActivityResult;
using enum BackgroundActivityResult;

class FakeActivity final : public VRXSchedulerActivityDelegate {
public:
    std::string identifier() const override { return "activity"; }
    bool requiresNetwork() const override { return true; }
    void performActivityForScheduler(const std::shared_ptr<VRXScheduler>&, CompletionHandler handler) override {
        ++runs;
        handler(result);
    }
    int runs = 0;
    BackgroundActivityResult result = Finished;
};

class SchedulerTest : public OnSimulatedHost {
protected:
    static constexpr const char* key = "activity.TargetDate";

    // What the system gets, and when, after a firing now.
    void fire() {
        const Date fired = host.clock.now();
        scheduler->performScheduledOutreachWithBlock([this, fired](BackgroundActivityResult result) {
            EXPECT_EQ(host.clock.now() - fired, Duration(1));
            EXPECT_EQ(host.queues.currentLabel(), "main");
            results.push_back(result);
        });
    }

    std::shared_ptr<FakeActivity> activity = std::make_shared<FakeActivity>();
    std::shared_ptr<VRXScheduler> scheduler = VRXScheduler::newSchedulerWithActivityDelegate(activity);
    std::vector<BackgroundActivityResult> results;
};

TEST_F(SchedulerTest, RegistersTruncatedCriteriaAndStoresTheDateAsItIs) {
    scheduler->monitorForScheduledActivity();  // which takes no criteria
    for (const auto& [delay, registered, gracePeriod] :
         {std::tuple(172800.0, 172800, 17280), {1, 1, 0}, {9.99, 9, 0}, {95, 95, 9}, {-50, 0, 0}}) {
        const Date date = host.clock.now() + Duration(delay);
        for (bool isByDate : {false, true}) {
            host.defaults.remove(key);
            isByDate ? scheduler->scheduleActivityForDate(date) : scheduler->scheduleActivityWithDelay(Duration(delay));
            EXPECT_EQ(host.activities.criteria("activity"), (ActivityCriteria{registered, gracePeriod, true}));
            EXPECT_EQ(scheduler->scheduledActivityDate(), date) << delay;
        }
    }
    EXPECT_EQ(host.log.lastMessage("scheduled '%@' with delay: %.02f (%@)"),
              "scheduled 'activity' with delay: -50.00 (2026-01-31 11:59:10 +0000)");
    scheduler->scheduleActivityForDate(std::nullopt);
    EXPECT_EQ(host.activities.criteria("activity"), (ActivityCriteria{0, 0, true}));
    EXPECT_EQ(scheduler->scheduledActivityDate(), std::nullopt);
    scheduler->scheduleActivityWithDelay(Duration(1e300));
    EXPECT_GT(host.activities.criteria("activity")->delay, 0);
}

TEST_F(SchedulerTest, RunsTheActivityFromItsTargetDateOn) {
    host.defaults.set(key, host.clock.now() + Duration(0.5));
    scheduler->monitorForScheduledActivity();
    EXPECT_EQ(host.defaults.writes().size(), 1u) << "monitoring leaves the date";
    fire();
    EXPECT_EQ(host.log.lastMessage("target not past for '%@', defer for: %.02f"),
              "target not past for 'activity', defer for: 0.50");
    EXPECT_EQ(activity->runs, 0);
    host.runFor(Duration(0.5));
    fire();
    EXPECT_TRUE(host.defaults.get(key).isNull()) << "removed at once";
    fire();
    EXPECT_EQ(activity->runs, 2) << "no target date is as good as one";
    activity->result = Deferred;
    host.defaults.set(key, host.clock.now() - Duration(9));
    fire();
    host.runFor(Duration(1));
    EXPECT_FALSE(host.defaults.get(key).isNull());
    EXPECT_THAT(results, ElementsAre(Deferred, Finished, Finished, Deferred));
}

}  // namespace
}  // namespace vrx
