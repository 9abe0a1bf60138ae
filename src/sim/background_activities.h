// The system's registry of activities under virtual time. What is registered is stored: it outlives the simulated
// process and, counted on by the wall clock, a boot. Handlers are the process's. Everything happens on a queue of the
// system's own, "activities".
//
// An activity fires a second after its delay at the earliest, once there is network if it needs any; while the system
// asks for deferral, its grace period is waited for. It is never fired while a run of it has not handed back its
// result, and no sooner than the minimum interval after a run that registered it itself. The system itself fires the
// upgrade activity at the first start of each version of the agent, and the boot activity once a boot, before all that
// was scheduled.
#pragma once

#include <map>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "vrx/platform/activity_timing.h"
#include "vrx/platform/background_activity_scheduler.h"
#include "vrx/sim/clock.h"
#include "vrx/sim/queues.h"

namespace vrx::sim {

class BackgroundActivities final : public platform::BackgroundActivities {
public:
    BackgroundActivities(const Clock& clock, Queues& queues) : clock_(clock), queues_(queues) {}

    void schedule(const platform::ActivityRegistration& registration, platform::ActivityHandler handler) override;
    bool shouldDefer(std::string_view /*identifier*/) const override { return shouldDefer_; }
    void setHandlerFactory(std::function<platform::ActivityHandler(const std::string& identifier)> factory) override {
        factory_ = std::move(factory);
    }

    // The state of the device.
    void setNetworkAvailable(bool isNetworkAvailable);
    void setShouldDefer(bool shouldDefer);
    void wallClockWasSet() { considerAll(); }

    // What happens to the process. It begins with the first start.
    void processStarted(const std::string& agentVersion);
    // Takes the handlers and the runs with it. A run that was under way begins anew in the next process.
    void processEnded();
    void booted();

    // What is registered: nothing once an activity has finished.
    std::optional<platform::ActivityCriteria> criteria(const std::string& identifier) const;
    std::optional<platform::Duration> timeLeft(const std::string& identifier) const;
    bool isRunning() const;

    struct Firing {
        std::string identifier;
        platform::Date date;
        bool operator==(const Firing&) const = default;
    };
    // All there were, in order.
    const std::vector<Firing>& firings() const { return firings_; }
    int firingCount(std::string_view identifier) const;

private:
    // Stored.
    struct Row {
        platform::ActivityCriteria criteria{};
        platform::DueTime due{};
        int generation = 0;
        int deferrals = 0;  // in a row
    };
    // In memory.
    struct Attachment {
        platform::ActivityHandler handler;
        std::optional<int> runningGeneration;  // while a run is under way
        bool isRegisteredByOwnRun = false;     // that is under way
    };

    platform::Moment now() const;
    void addRow(const std::string& identifier, const platform::ActivityCriteria& criteria, platform::DueTime due);
    bool isHeldForBoot(const std::string& identifier);
    void considerAll();
    void considerLater(const std::string& identifier, platform::Duration delay);
    void consider(const std::string& identifier);
    void fire(const std::string& identifier, int generation);
    void takeResult(const std::string& identifier, platform::BackgroundActivityResult result);

    const Clock& clock_;
    Queues& queues_;
    const std::shared_ptr<platform::Queue> lane_ = queues_.makeSerialQueue("activities");
    std::map<std::string, Row, std::less<>> rows_;
    int lastGeneration_ = 0;
    int boot_ = 0;
    std::string lastVersion_;
    bool isBootActivityOwed_ = true;

    std::map<std::string, Attachment, std::less<>> attachments_;
    std::function<platform::ActivityHandler(const std::string& identifier)> factory_;
    bool isNetworkAvailable_ = true;
    bool shouldDefer_ = false;
    std::vector<Firing> firings_;
};

}  // namespace vrx::sim
