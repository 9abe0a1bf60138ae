#include "vrxsim/player.h"

#include <algorithm>
#include <exception>
#include <string>

#include "timeline/recorder.h"
#include "vrx/platform/text.h"
#include "vrx/service/start_up.h"
#include "vrxsim/clients.h"
#include "vrxsim/differences.h"
#include "vrxsim/invariants.h"
#include "vrxsim/rules.h"
#include "vrxsim/world.h"

namespace vrx::simulation {

using platform::Duration;

namespace {

constexpr double checkInterval = secondsOfDay / 2;
constexpr double instant = 1e-6;  // less than any time that matters

// Thrown through the start of a process that is killed.
struct Killed {};

class Player {
public:
    Player(const Life& life, const PlayOptions& options) : life_(life), options_(options) {
        trace_.show = options.show;
        rules_.beforeChange = [this] { differences_.judge(); };
        clients_.dismissalIsAsked = [this](const std::string& serialNumber) {
            rules_.dismissalIsAsked(serialNumber);
            differences_.dismissalIsAsked(serialNumber);
        };
        world_.host.interference.planted = options.planted;
        world_.host.activities.setShareOfGrace(options.shareOfGrace);
        if (!options.isJudged) {
            world_.host.log.lowest = platform::Level::Error;
            rules_.turnOff();
        }
        world_.host.failures.handler = [this](const std::string& text) {
            verdict_.report(day(), "simulation", text);
            world_.host.queues.stop();  // it may have no end
        };
    }

    Play run() {
        for (const Event& event : life_.beginning) happen(event);
        if (options_.isRecorded) recorder_.emplace(world_.host);
        start([this] { world_.host.process.launch([this] { return begin(); }); });
        lookAround();
        const double end = static_cast<double>(life_.days) * secondsOfDay;
        while (world_.elapsed() < end - instant && !verdict_.violation) {
            advance(std::min({end, nextEventAt(), nextCheckAt_, relaunchAt_.value_or(end)}));
            if (relaunchAt_ && *relaunchAt_ <= world_.elapsed() + instant) relaunch();
            while (nextEvent_ < life_.events.size() && nextEventAt() <= world_.elapsed() + instant)
                happen(life_.events[nextEvent_++]);
            lookAround();
        }
        Play result{.trace = trace_.hash(),
                    .days = day(),
                    .violation = verdict_.violation,
                    .differences = differences_.found(),
                    .restlessDays = invariants_.restlessDays()};
        if (recorder_) result.chronicle = recorder_->chronicle();
        disarm();
        world_.host.queues.letWaitingTasksGo();
        clients_.processEnds();
        return result;
    }

private:
    double day() const { return world_.elapsed() / secondsOfDay; }
    double nextEventAt() const {
        return nextEvent_ < life_.events.size() ? static_cast<double>(life_.events[nextEvent_].second)
                                                : static_cast<double>(life_.days) * secondsOfDay;
    }

    // The main of each process.
    std::shared_ptr<void> begin() {
        clients_.processEnds();  // one that ended by itself has been seen by nobody else
        return std::make_shared<StartUp>();
    }

    void start(const std::function<void()>& launch) {
        relaunchAt_.reset();
        isStarting_ = true;
        try {
            launch();
        } catch (const Killed&) {
        }
        isStarting_ = false;
        invariants_.processStarted();
        differences_.processStarts();
        if (isKillWanted_) cutShort();
    }
    void relaunch() {
        if (std::exchange(isBootWanted_, false)) world_.host.activities.booted();
        start([this] { world_.host.process.relaunch(); });
    }

    // Lets time pass up to a moment, or to the death of the process before it.
    void advance(double until) {
        while (world_.elapsed() < until - instant && !isKillWanted_ && !verdict_.violation) {
            judgeDifferences();
            const Duration rest(std::min(until, differences_.nextMoment().value_or(until)) - world_.elapsed());
            try {
                if (piecesLeft_ > 0)
                    workOff(world_.host.clock.now() + rest);
                else
                    world_.host.runFor(rest);
            } catch (const Killed&) {
            }
        }
        judgeDifferences();
        if (isKillWanted_) cutShort();
    }
    // One piece after another, the last of which ends the process.
    void workOff(platform::Date until) {
        if (!world_.host.queues.runOne(until)) return world_.host.runUntil(until);
        if (--piecesLeft_ == 0) isKillWanted_ = true;
    }

    void die(double downTime) {
        disarm();
        clients_.processEnds();
        rules_.processEnds();
        world_.host.process.kill();
        relaunchAt_ = world_.elapsed() + downTime;
    }
    // The process ends in the midst of what it does.
    void cutShort() {
        invariants_.processWasCutShort();
        die(downTime_);
        isKillWanted_ = false;
    }
    void disarm() {
        piecesLeft_ = callsLeft_ = 0;
        world_.host.interference.beforeCall = nullptr;
    }

    // Before each call of a facility, while a kill is to come. A task that is killed never returns from here; its stack
    // is unwound when the process ends.
    void facilityIsCalled() {
        const bool isInTask = world_.host.queues.isInTask();
        if (isKillWanted_ || !(isInTask || isStarting_) || std::uncaught_exceptions() > 0) return;
        if (--callsLeft_ > 0) return;
        isKillWanted_ = true;
        if (!isInTask) throw Killed();
        world_.host.queues.stop();
        world_.host.queues.makeEvent()->wait();
    }

    void happen(const Event& event) {
        judgeDifferences();
        trace_.add(event.verb);
        if (trace_.show) trace_.show(textOf(event));
        if (event.verb == "clock") lookAround();  // while its dates still tell when things were
        if (event.verb == "take-back") {
            clients_.takeBackDismissals();
            differences_.dismissalsAreTakenBack();
        }
        if (!world_.happen(event) && !clients_.happen(event)) happenToProcess(event);
    }
    void happenToProcess(const Event& event) {
        const auto number = [&](std::size_t word) { return numberFrom(event.words[word]); };
        if (event.verb == "reboot") {
            isBootWanted_ = true;
            die(number(0));
        } else if (event.verb == "upgrade") {
            world_.host.process.agentVersion += "1";
            die(0);
        } else if (event.verb == "kill") {
            die(number(0));
        } else {
            downTime_ = number(1);
            const int count = std::max(1, static_cast<int>(number(0)));
            disarm();
            if (event.verb == "kill-after-work") {
                piecesLeft_ = count;
            } else {
                callsLeft_ = count;
                world_.host.interference.beforeCall = [this] { facilityIsCalled(); };
            }
        }
    }

    // Takes down what has happened since the last time, and checks what is there now.
    void lookAround() {
        clients_.check();
        if (options_.takeSent) std::ranges::for_each(world_.host.http.sent(), options_.takeSent);
        if (options_.isJudged) judge();
        world_.host.forgetRecords();
        nextCheckAt_ = world_.elapsed() + checkInterval;
    }
    void judgeDifferences() {
        if (options_.isJudged) differences_.judge();
    }
    void judge() {
        invariants_.check();
        rules_.check();
        if (recorder_) recorder_->look();
        for (const platform::LogEntry& line : world_.host.log.entries()) takeDown(line);
        for (const sim::SentRequest& sent : world_.host.http.sent()) {
            trace_.add(sent.request.url);
            trace_.add(sent.body());
        }
        for (const auto& firing : world_.host.activities.firings()) {
            trace_.add(firing.identifier);
            trace_.add(std::to_string(platform::epochSeconds(firing.date)));
            if (trace_.show) trace_.show("  fires " + firing.identifier);
        }
        for (const platform::FollowUpItem& item : world_.items()) {
            trace_.add(item.uniqueIdentifier);
            trace_.add(item.title.value_or("") + item.informativeFooterText.value_or(""));
            if (trace_.show) trace_.show("  shown " + platform::describe(item.userInfo));
        }
    }
    void takeDown(const platform::LogEntry& line) {
        trace_.add(line.format);
        for (const platform::LogArgument& argument : line.arguments) trace_.add(argument.text);
        if (trace_.show) trace_.show("  " + line.message(true));
    }

    const Life& life_;
    const PlayOptions& options_;
    Verdict verdict_;
    Trace trace_;
    World world_;
    Rules rules_{world_, verdict_};
    Clients clients_{world_, rules_, verdict_, trace_};
    Invariants invariants_{world_, clients_, verdict_};
    std::optional<timeline::Recorder> recorder_;
    Differences differences_{world_, rules_, verdict_};
    std::size_t nextEvent_ = 0;
    double nextCheckAt_ = 0;
    std::optional<double> relaunchAt_;  // while there is no process
    bool isBootWanted_ = false;
    bool isStarting_ = false;
    // The kill to come.
    bool isKillWanted_ = false;
    int piecesLeft_ = 0, callsLeft_ = 0;
    double downTime_ = 0;
};

}  // namespace

Play play(const Life& life, const PlayOptions& options) {
    return Player(life, options).run();
}

}  // namespace vrx::simulation
