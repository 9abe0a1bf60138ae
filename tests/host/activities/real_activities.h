// The host's registry of activities on a real database, under the simulation's time.
#pragma once

#include <optional>
#include <string>

#include "host/support.h"
#include "vrx/host/activities/background_activities.h"
#include "vrx/sim/host.h"

namespace vrx {

class RealActivities {
public:
    RealActivities() : ownFolder_(std::in_place), path_(*ownFolder_ / "host.db") {}
    explicit RealActivities(std::string databasePath) : path_(std::move(databasePath)) {}

    platform::BackgroundActivities& activities() { return *process_; }
    void pass(Duration time) { host_.runFor(time); }
    double elapsed() const { return host_.clock.elapsed().count(); }
    // Returns what the new process has its registry in.
    host::Database& restart() {
        end();
        start();
        return *database_;
    }
    void boot(Duration downTime) {
        end();
        pass(downTime);
        ++conditions_.boot;
        start();
    }
    void setWallClock(Duration ahead) {
        host_.clock.set(host_.clock.now() + ahead);
        conditions_.calls.wallClockSet();
    }
    void setNetworkAvailable(bool isAvailable) {
        conditions_.isAvailable = isAvailable;
        if (conditions_.watched.network) conditions_.calls.wake();
    }
    void setShouldDefer(bool shouldDefer) {
        conditions_.isDeferring = shouldDefer;
        if (conditions_.watched.deferral) conditions_.calls.wake();
    }
    void setNetworkMetered(bool isMetered) {
        conditions_.isMetered = isMetered;
        if (conditions_.watched.deferral) conditions_.calls.wake();
    }

    host::BackgroundActivities& registry() { return *process_; }
    const std::string& databasePath() const { return path_; }
    std::vector<host::ScheduledActivity> scheduled() { return host::listActivities(*database_)->scheduled; }
    // Does the next piece of work; false when there is none within that time.
    bool step(Duration within) { return host_.queues.runOne(host_.clock.now() + within); }
    std::vector<std::string> logged() const { return host_.log.messages(platform::Level::Default); }
    // Whether a run is under way, or its end or anything else not stored yet.
    bool hasWorkInFlight() { return host_.process.beginWork().use_count() > 2; }
    int wakeUps() const { return conditions_.wakeUps; }

private:
    struct Conditions final : host::ActivityConditions {
        explicit Conditions(sim::Host& host) : host(host) {}
        platform::Moment now() const override { return {std::to_string(boot), host.clock.elapsed(), host.clock.now()}; }
        bool shouldDefer(bool needsNetwork) const override { return isDeferring || (needsNetwork && isMetered); }
        Duration minimumInterval() const override { return platform::minimumInterval; }
        void start(Calls newCalls) override { calls = std::move(newCalls); }
        bool isNetworkAvailable() override { return isAvailable; }
        void wakeAt(std::optional<Duration> sinceBoot, Watched newWatched) override {
            watched = newWatched;
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
        bool isMetered = false;
        bool isAvailable = true;
        Watched watched;
        int alarm = 0;  // the last one asked for
        int wakeUps = 0;
    };
    void start() {
        // Whoever waits for a lock here waits for himself: then the test does not end.
        database_.emplace(path_, host::Database::currentSchema, std::chrono::hours(1));
        process_.emplace(host::BackgroundActivities::Surroundings{*database_, host_.queues.mainQueue(),
                                                                  host_.queues.workers(platform::Priority::Background),
                                                                  conditions_, host_.process});
        process_->start("1");
    }
    void end() {
        host_.queues.discardWork();
        process_.reset();
        database_.reset();
    }

    std::optional<host::TemporaryFolder> ownFolder_;
    const std::string path_;
    sim::Host host_;
    Conditions conditions_{host_};
    std::optional<host::Database> database_;
    std::optional<host::BackgroundActivities> process_;
};

}  // namespace vrx
