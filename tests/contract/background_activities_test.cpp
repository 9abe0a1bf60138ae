// What every registry of background activities does, simulated or real. Times are seconds since the test began.
#include "vrx/platform/background_activity_scheduler.h"

#include <chrono>

#include "contract/hosts.h"
#include "host/activities/real_activities.h"
#include "vrx/platform/activity_timing.h"

namespace vrx {
namespace {

using platform::ActivityCriteria;
using platform::BackgroundActivityResult;
using testing::UnorderedElementsAre;
using enum BackgroundActivityResult;

class SimulatedActivities {
public:
    platform::BackgroundActivities& activities() { return host_.activities; }
    void pass(Duration time) { host_.runFor(time); }
    double elapsed() const { return host_.clock.elapsed().count(); }
    // The process ends, and the system starts another.
    void restart() {
        host_.process.kill();
        host_.process.launch([] { return nullptr; });
    }
    void boot(Duration downTime) { host_.process.reboot(downTime); }
    void setWallClock(Duration ahead) {
        host_.clock.set(host_.clock.now() + ahead);
        host_.activities.wallClockWasSet();
    }
    void setNetworkAvailable(bool isAvailable) { host_.activities.setNetworkAvailable(isAvailable); }
    void setShouldDefer(bool shouldDefer) { host_.activities.setShouldDefer(shouldDefer); }
    void setNetworkMetered(bool isMetered) { host_.activities.setNetworkMetered(isMetered); }

private:
    sim::Host host_;
};

template <class Subject>
class BackgroundActivitiesContract : public testing::Test {
protected:
    void SetUp() override { subject.restart(); }

    void schedule(const ActivityCriteria& criteria, const char* handlerName = "", bool isByOwnRun = false) {
        subject.activities().schedule({.identifier = "a", .criteria = criteria, .isByOwnRun = isByOwnRun},
                                      handler(handlerName));
    }
    void monitor(const char* handlerName = "") {
        subject.activities().schedule({.identifier = "a", .isPreregistered = true}, handler(handlerName));
    }
    // Writes down who fires and when, and answers at once, unless there is nothing to answer.
    platform::ActivityHandler handler(std::string name) {
        return [this, name](platform::OnceCallback<BackgroundActivityResult> completion) {
            firings.push_back(name + std::to_string(static_cast<int>(std::ceil(subject.elapsed()))));
            if (answer)
                completion(*answer);
            else
                open = std::move(completion);
        };
    }
    std::vector<std::string> firingsAfter(Duration time) {
        subject.pass(time);
        return std::exchange(firings, {});
    }

    std::optional<BackgroundActivityResult> answer = Finished;
    platform::OnceCallback<BackgroundActivityResult> open;
    std::vector<std::string> firings;
    Subject subject;
};

using Subjects = testing::Types<SimulatedActivities, RealActivities>;
TYPED_TEST_SUITE(BackgroundActivitiesContract, Subjects, HostNames);

TYPED_TEST(BackgroundActivitiesContract, FireOnceASecondAfterTheDelay) {
    this->monitor();
    EXPECT_THAT(this->firingsAfter(1h), IsEmpty()) << "nothing is registered";
    this->schedule({.delay = 0});
    EXPECT_THAT(this->firingsAfter(1h), ElementsAre("3601"));
    this->schedule({.delay = 100});
    this->schedule({.delay = 200}, "later ");
    EXPECT_THAT(this->firingsAfter(1h), ElementsAre("later 7401")) << "one row and one handler";
    this->schedule({.delay = 100});
    this->monitor("monitor ");
    EXPECT_THAT(this->firingsAfter(1h), ElementsAre("monitor 10901"));
    EXPECT_THAT(this->firingsAfter(240h), IsEmpty());
}

TYPED_TEST(BackgroundActivitiesContract, TryAgainAfterADeferredResult) {
    this->answer = Deferred;
    this->schedule({.delay = 99});
    EXPECT_THAT(this->firingsAfter(3h), ElementsAre("100", "101", "161", "461", "1061", "2261", "4661", "8261"));
    this->answer = Finished;
    EXPECT_EQ(this->firingsAfter(1h).size(), 1u);
    EXPECT_THAT(this->firingsAfter(24h), IsEmpty());
}

TYPED_TEST(BackgroundActivitiesContract, NeverFireARunTwice) {
    this->answer.reset();
    this->schedule({.delay = 0});
    EXPECT_THAT(this->firingsAfter(1h), ElementsAre("1"));
    this->schedule({.delay = 0}, "own ", true);
    this->monitor("own ");
    EXPECT_THAT(this->firingsAfter(1h), IsEmpty()) << "the result isn't there yet";
    this->open(Finished);  // which is not the new registration's
    EXPECT_THAT(this->firingsAfter(899s), IsEmpty());
    EXPECT_THAT(this->firingsAfter(1h), ElementsAre("own 8100"));
    this->schedule({.delay = 300}, "own ", true);
    this->open(Finished);
    EXPECT_THAT(this->firingsAfter(1h), ElementsAre("own 12000")) << "the quarter of an hour is for no delay";
    this->schedule({.delay = 0}, "own ", true);
    this->schedule({.delay = 1}, "other ");
    this->open(Finished);
    EXPECT_EQ(this->firingsAfter(1h).size(), 1u);
    this->open(Deferred);
    this->answer = Finished;
    EXPECT_EQ(this->firingsAfter(1h).size(), 1u);
}

TYPED_TEST(BackgroundActivitiesContract, WaitForNetworkAndForTheGracePeriod) {
    this->subject.setNetworkAvailable(false);
    this->subject.setShouldDefer(true);
    this->schedule({.delay = 99, .gracePeriod = 500, .requiresNetwork = true});
    EXPECT_THAT(this->firingsAfter(200s), IsEmpty());
    this->subject.setNetworkAvailable(true);
    EXPECT_THAT(this->firingsAfter(399s), IsEmpty());
    EXPECT_THAT(this->firingsAfter(1h), ElementsAre("600"));
    this->schedule({.delay = 0, .gracePeriod = 500});
    EXPECT_THAT(this->firingsAfter(10s), IsEmpty());
    EXPECT_TRUE(this->subject.activities().shouldDefer("a"));
    this->subject.setShouldDefer(false);
    EXPECT_EQ(this->firingsAfter(1s).size(), 1u);
}

TYPED_TEST(BackgroundActivitiesContract, DeferOnAMeteredNetworkWhatNeedsIt) {
    this->subject.setNetworkMetered(true);
    this->schedule({.delay = 0, .gracePeriod = 500});
    EXPECT_EQ(this->firingsAfter(1s).size(), 1u);
    this->answer.reset();
    this->schedule({.delay = 0, .gracePeriod = 500, .requiresNetwork = true});
    EXPECT_THAT(this->firingsAfter(499s), IsEmpty());
    EXPECT_EQ(this->firingsAfter(2s).size(), 1u);
    EXPECT_TRUE(this->subject.activities().shouldDefer("a")) << "while it runs";
    this->subject.setNetworkMetered(false);
    EXPECT_FALSE(this->subject.activities().shouldDefer("a"));
    this->open(BackgroundActivityResult::Finished);
}

TYPED_TEST(BackgroundActivitiesContract, OutliveTheProcess) {
    this->schedule({.delay = 99});
    this->subject.restart();
    EXPECT_THAT(this->firingsAfter(200s), IsEmpty()) << "nobody is there to run it";
    this->monitor("late ");
    EXPECT_THAT(this->firingsAfter(1s), ElementsAre("late 200"));

    this->schedule({.delay = 99});
    this->subject.restart();
    this->subject.activities().setHandlerFactory(
        [&](const std::string& identifier) { return identifier == "a" ? this->handler("made ") : nullptr; });
    EXPECT_THAT(this->firingsAfter(200s), ElementsAre("made 301"));

    // The end of the process cuts a run off: it begins anew, each time later, as after a deferral.
    this->answer.reset();
    this->schedule({.delay = 0});
    EXPECT_EQ(this->firingsAfter(2s).size(), 1u);
    for (Duration wait : {Duration(1s), Duration(60s)}) {
        this->open.letGo();
        this->subject.restart();
        this->monitor();
        EXPECT_THAT(this->firingsAfter(wait - 0.5s), IsEmpty());
        EXPECT_EQ(this->firingsAfter(1s).size(), 1u);
    }
    this->open(Finished);
}

TYPED_TEST(BackgroundActivitiesContract, CountDelaysByTheWallClockOverABootOnly) {
    this->schedule({.delay = 3599});
    this->subject.setWallClock(-1000h);
    this->subject.setWallClock(2000h);
    EXPECT_THAT(this->firingsAfter(3599s), IsEmpty());
    EXPECT_THAT(this->firingsAfter(1s), ElementsAre("3600"));

    this->schedule({.delay = 3599});
    this->subject.boot(600s);
    this->monitor();
    EXPECT_THAT(this->firingsAfter(50min - 1s), IsEmpty());
    EXPECT_THAT(this->firingsAfter(1s), ElementsAre("7200"));

    // A clock that starts too early is found out: the delay is the most that can be left, and less once it is set.
    this->schedule({.delay = 3599});
    this->subject.boot(60s);
    this->subject.setWallClock(-100000h);
    this->monitor();
    EXPECT_THAT(this->firingsAfter(30min), IsEmpty());
    this->subject.setWallClock(100000h);
    EXPECT_THAT(this->firingsAfter(29min - 1s), IsEmpty());
    EXPECT_THAT(this->firingsAfter(1s), ElementsAre("10800"));
}

TYPED_TEST(BackgroundActivitiesContract, FireTheSystemsOwnOncePerVersionAndBoot) {
    auto monitorBoth = [&] {
        for (const char* name : {"upgrade", "boot"})
            this->subject.activities().schedule(
                {.identifier = std::string("com.orvane.vrxagent.") + name, .isPreregistered = true},
                this->handler(name));
    };
    monitorBoth();
    EXPECT_THAT(this->firingsAfter(0s), UnorderedElementsAre("upgrade0", "boot0"));
    this->subject.restart();
    monitorBoth();
    EXPECT_THAT(this->firingsAfter(1h), IsEmpty());
    this->subject.boot(10s);
    monitorBoth();
    EXPECT_THAT(this->firingsAfter(1h), ElementsAre("boot3610"));

    // What is due at the boot is registered anew before it fires.
    this->schedule({.delay = 0}, "early ");
    this->subject.boot(10s);
    this->monitor("early ");
    this->subject.activities().schedule({.identifier = "com.orvane.vrxagent.boot", .isPreregistered = true},
                                        [&](platform::OnceCallback<BackgroundActivityResult> completion) {
                                            this->schedule({.delay = 0}, "taken up ");
                                            completion(Finished);
                                        });
    EXPECT_THAT(this->firingsAfter(1h), ElementsAre("taken up 7221"));

    // With a wrong clock the boot activity finds much too long a delay. Once the clock is set, it is what is left.
    this->schedule({.delay = 3599}, "far ");
    this->subject.boot(10s);
    this->subject.setWallClock(-100000h);
    this->monitor("far ");
    this->subject.activities().schedule({.identifier = "com.orvane.vrxagent.boot", .isPreregistered = true},
                                        [&](platform::OnceCallback<BackgroundActivityResult> completion) {
                                            this->schedule({.delay = 100000 * 3600 + 3589}, "far ");
                                            completion(Finished);
                                        });
    EXPECT_THAT(this->firingsAfter(2h), IsEmpty());
    this->subject.setWallClock(100000h);
    EXPECT_THAT(this->firingsAfter(2s), ElementsAre(testing::StartsWith("far ")));
}

}  // namespace
}  // namespace vrx
