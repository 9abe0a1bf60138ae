// The system's registry of activities under virtual time. Registrations are stored: they outlive the simulated process
// and, by the wall clock, a boot. Handlers belong to the process. Everything happens on the system's own queue,
// "activities".
//
// An activity fires a second after its delay at the earliest, and if it needs a network not before there is one. While
// the system asks for deferral, an activity waits for its grace period to end. It never fires while a run of it has not
// returned its result, and no sooner than the minimum interval after a run that registered it itself. The system itself
// fires the upgrade activity at the first start of each version of the agent, and the boot activity once a boot, before
// everything that was scheduled.
#pragma once

#include <map>
#include <memory>
#include <optional>
#include <set>
#include <string>
#include <vector>

#include "vrx/platform/activity_timing.h"
#include "vrx/platform/background_activity_scheduler.h"
#include "vrx/sim/clock.h"
#include "vrx/sim/interference.h"
#include "vrx/sim/queues.h"

namespace vrx::sim {

class BackgroundActivities final : public platform::BackgroundActivities {
public:
    BackgroundActivities(const Clock& clock, Queues& queues, const Interference& interference)
        : clock_(clock), queues_(queues), interference_(interference) {}

    void schedule(const platform::ActivityRegistration& registration, platform::ActivityHandler handler) override;
    bool shouldDefer(std::string_view identifier) const override;
    void setHandlerFactory(std::function<platform::ActivityHandler(const std::string& identifier)> factory) override {
        factory_ = std::move(factory);
    }

    // The state of the device. A network that leads no further than to a portal is none, and a user who saves power
    // asks for deferral.
    void setNetworkAvailable(bool isNetworkAvailable);
    void setShouldDefer(bool shouldDefer);
    // What needs the network then defers.
    void setNetworkMetered(bool isNetworkMetered);
    // Every activity fires this share of its grace period later, from 0 to 1: what a registry would do that spreads
    // what many devices do at the same time.
    void setShareOfGrace(double share) { shareOfGrace_ = share; }
    void wallClockWasSet() { considerAll(); }

    // What happens to the process. Its life begins with the first start.
    void processStarted(const std::string& agentVersion);
    // Drops the handlers and the runs. The next process begins a run that was under way anew, as after a deferral.
    void processEnded();
    void booted();

    // For a simulation that begins in the midst of a life, before the first start of the process: what an earlier
    // process has registered. It is due when the time left is over.
    struct Registered {
        platform::ActivityCriteria criteria{};
        platform::Duration timeLeft{};
        int deferrals = 0;           // deferred or interrupted runs in a row
        bool isInterrupted = false;  // a run of it was under way when that process ended
    };
    void takeOver(const std::string& identifier, const Registered& registered);
    // What the system has fired on its own by then: the upgrade activity of that version, and that of this boot.
    void takeOverFired(std::string agentVersion, bool isBootActivityFired);
    // The least time between a run and the next one that it registers with no delay.
    void setMinimumInterval(platform::Duration interval) { minimumInterval_ = interval; }

    // What is registered; null once an activity has finished.
    std::optional<platform::ActivityCriteria> criteria(const std::string& identifier) const;
    std::optional<platform::Duration> timeLeft(const std::string& identifier) const;
    std::vector<std::string> registered() const;
    bool isRunning() const;

    struct Firing {
        std::string identifier;
        platform::Date date;
        bool operator==(const Firing&) const = default;
    };
    // All firings, in order.
    const std::vector<Firing>& firings() const { return firings_; }
    void forgetFirings() { firings_.clear(); }
    int firingCount(std::string_view identifier) const;
    // Called at each firing, before its handler.
    void setFiringObserver(std::function<void(const std::string& identifier)> observer) {
        firingObserver_ = std::move(observer);
    }

private:
    // Stored.
    struct Row {
        platform::ActivityCriteria criteria{};
        platform::DueTime due{};
        int generation = 0;
        int deferrals = 0;  // deferred or interrupted runs in a row
        bool isInterrupted = false;
    };
    // In memory.
    struct Attachment {
        platform::ActivityHandler handler;
        std::optional<int> runningGeneration;  // null without a run under way
        bool doesRunNeedNetwork = false;
        bool isRegisteredByOwnRun = false;  // by the run that is under way
    };

    platform::Moment now() const;
    void addRow(const std::string& identifier, const platform::ActivityCriteria& criteria, platform::DueTime due);
    bool isAfterBoot() const;
    bool isHeldForBoot(const std::string& identifier);
    void considerAll();
    void considerLater(const std::string& identifier, platform::Duration delay);
    void consider(const std::string& identifier);
    void fire(const std::string& identifier, int generation);
    void plantDefect(platform::DueTime& due) const;
    void takeResult(const std::string& identifier, platform::BackgroundActivityResult result);

    const Clock& clock_;
    Queues& queues_;
    const Interference& interference_;
    const std::shared_ptr<platform::Queue> lane_ = queues_.makeSerialQueue("activities");
    std::map<std::string, Row, std::less<>> rows_;
    int lastGeneration_ = 0;
    int boot_ = 0;
    std::string lastVersion_;
    bool isBootActivityOwed_ = true;

    std::map<std::string, Attachment, std::less<>> attachments_;
    std::function<platform::ActivityHandler(const std::string& identifier)> factory_;
    std::map<std::string, std::set<platform::Duration>> looks_;  // when activities will be considered
    bool isNetworkAvailable_ = true;
    bool shouldDefer_ = false;
    bool isNetworkMetered_ = false;
    double shareOfGrace_ = 0;
    std::vector<Firing> firings_;
    std::function<void(const std::string& identifier)> firingObserver_;
    platform::Duration minimumInterval_ = platform::minimumInterval;
};

}  // namespace vrx::sim
