// The system's registry of background activities, in host.db. Fires each on a worker when it is due, and resumes at the
// start what earlier processes scheduled. Sleeps until the next one is due.
//
// host.db decides what fires; memory holds only what belongs to the process, handlers and runs. So the registry follows
// the file when it is replaced, and a run that the end of a process interrupted is found at the next start as one
// without an end. While the file cannot be written nothing fires, because the end of the run could not be stored
// either; changes are kept and stored later, in order.
#pragma once

#include <atomic>
#include <map>
#include <mutex>
#include <set>
#include <string>
#include <vector>

#include "vrx/host/activities/activity_conditions.h"
#include "vrx/host/activities/activity_registry.h"
#include "vrx/host/activities/activity_requests.h"
#include "vrx/host/home/database.h"
#include "vrx/platform/background_activity_scheduler.h"
#include "vrx/platform/process_lifecycle.h"
#include "vrx/platform/queue.h"

namespace vrx::host {

class BackgroundActivities final : public platform::BackgroundActivities {
public:
    // All must outlive this object. Handlers run on the workers.
    struct Surroundings {
        Database& database;
        platform::Queue& mainLoop;
        platform::Queue& workers;
        ActivityConditions& conditions;
        platform::ProcessLifecycle& lifecycle;
    };
    explicit BackgroundActivities(const Surroundings& surroundings) : around_(surroundings) {}

    // Begins to fire activities, for an agent of that version. Main thread, once, when start-up has registered its
    // handlers.
    void start(std::string agentVersion);
    // Fires what is due and what testers have requested. To be called after a change that is not noticed here. Main
    // thread.
    void reconsider();
    // Stores nothing any more, because the home is lost. What could not be stored keeps the process no longer. Main
    // thread.
    void abandon();

    // A scheduled activity fires once: none repeats, and all are of background quality.
    void schedule(const platform::ActivityRegistration& registration, platform::ActivityHandler handler) override;
    bool shouldDefer(std::string_view identifier) const override;
    void setHandlerFactory(std::function<platform::ActivityHandler(const std::string&)> factory) override;

private:
    using Change = std::function<void(Connection&)>;

    // One firing, from its beginning to its result.
    struct Run {
        std::string identifier;
        std::int64_t generation;
    };

    bool failed(const platform::Error& error);
    platform::Duration nextRetry();
    bool write(const Change& change);
    bool store(Change change);
    bool storeUnsaved();
    bool hasUnsaved();
    bool takeUpIfReplaced();
    void carryOver();
    bool answerRequests();
    bool fireDue();
    FiringAnswer fireRequested(const std::string& identifier);
    bool fire(const ScheduledActivity& activity, const platform::ActivityHandler& handler);
    void end(const Run& run, platform::BackgroundActivityResult result);
    platform::ActivityHandler handlerFor(const std::string& identifier);
    bool isRunning(const std::string& identifier) const;

    const Surroundings around_;

    // Main thread.
    bool isStarted_ = false;
    std::string agentVersion_;
    std::uint64_t takenUp_ = 0;  // the opening of the database that was last taken up

    mutable std::mutex mutex_;
    std::map<std::string, platform::ActivityHandler, std::less<>> handlers_;
    std::function<platform::ActivityHandler(const std::string&)> factory_;
    std::set<std::string, std::less<>> running_;
    std::set<std::string, std::less<>> needingNetwork_;      // identifiers that are running
    std::set<std::string, std::less<>> registeredByOwnRun_;  // identifiers that are running

    std::atomic<bool> isFailing_ = false;  // whether the database fails, which is logged once
    std::atomic<bool> isBusy_ = false;     // whether that is because another process writes it
    std::atomic<int> failures_ = 0;        // in a row
    std::atomic<bool> isAbandoned_ = false;
    std::mutex storing_;  // taken before the database
    std::mutex unsavedMutex_;
    std::vector<Change> unsaved_;         // in their order; only who stores removes some
    platform::WorkInFlight unsavedWork_;  // while there are unsaved changes
};

}  // namespace vrx::host
