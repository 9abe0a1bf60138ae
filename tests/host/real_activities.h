// The host's registry of activities on a real database, under the simulation's time.
#pragma once

#include <optional>
#include <string>

#include "host/background_activities.h"
#include "sim/host.h"
#include "support.h"

namespace vrx {

class RealActivities {
public:
    platform::BackgroundActivities& activities() { return *process_; }
    void pass(platform::Duration time) { host_.runFor(time); }
    double elapsed() const { return host_.clock.elapsed().count(); }
    void restart() {
        end();
        start();
    }
    void boot(platform::Duration downTime) {
        end();
        pass(downTime);
        ++conditions_.boot;
        start();
    }
    void setWallClock(platform::Duration ahead) {
        host_.clock.set(host_.clock.now() + ahead);
        conditions_.calls.wallClockSet();
    }
    void setNetworkAvailable(bool isAvailable) {
        conditions_.isAvailable = isAvailable;
        if (conditions_.isNetworkWatched) conditions_.calls.wake();
    }
    void setShouldDefer(bool shouldDefer) {
        conditions_.isDeferring = shouldDefer;
        process_->reconsider();
    }

    host::Database database() const { return host::Database(folder_ / "host.db"); }
    const host::TemporaryFolder& folder() const { return folder_; }
    host::BackgroundActivities& registry() { return *process_; }
    const sim::SystemLog& log() const { return host_.log; }
    int wakeUps() const { return conditions_.wakeUps; }

private:
    struct Conditions final : host::ActivityConditions {
        explicit Conditions(sim::Host& host) : host(host) {}
        platform::Moment now() const override { return {std::to_string(boot), host.clock.elapsed(), host.clock.now()}; }
        bool shouldDefer() const override { return isDeferring; }
        platform::Duration minimumInterval() const override { return platform::minimumInterval; }
        void start(Calls newCalls) override { calls = std::move(newCalls); }
        bool isNetworkAvailable() override { return isAvailable; }
        void wakeAt(std::optional<platform::Duration> sinceBoot, bool whenNetworkChanges) override {
            isNetworkWatched = whenNetworkChanges;
            ++alarm;
            if (!sinceBoot) return;
            host.queues.mainQueue().postAfter(*sinceBoot - host.clock.elapsed(), [this, armed = alarm] {
                if (armed != alarm) return;
                ++wakeUps;
                calls.wake();
            });
        }

        sim::Host& host;
        Calls calls;
        int boot = 0;
        bool isDeferring = false;
        bool isAvailable = true;
        bool isNetworkWatched = false;
        int alarm = 0;  // the last one asked for
        int wakeUps = 0;
    };
    struct Lifecycle final : platform::ProcessLifecycle {
        void exitCleanWhenIdle() override {}
        platform::WorkInFlight beginWork() override { return std::make_shared<int>(); }
    };

    void start() {
        database_.emplace(folder_ / "host.db");
        process_.emplace(host::BackgroundActivities::Surroundings{*database_, host_.queues.mainQueue(),
                                                                  host_.queues.workers(platform::Priority::Background),
                                                                  conditions_, lifecycle_});
        process_->start("1");
    }
    // What is posted refers to the registry.
    void end() {
        host_.run();
        ++conditions_.alarm;
        process_.reset();
        database_.reset();
    }

    host::TemporaryFolder folder_;
    sim::Host host_;
    Conditions conditions_{host_};
    Lifecycle lifecycle_;
    std::optional<host::Database> database_;
    std::optional<host::BackgroundActivities> process_;
};

}  // namespace vrx
