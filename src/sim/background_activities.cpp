#include "vrx/sim/background_activities.h"

#include <algorithm>
#include <iterator>
#include <utility>

#include "vrx/platform/task.h"
#include "vrx/platform/vendor.h"

namespace vrx::sim {

using platform::ActivityCriteria;
using platform::ActivityHandler;
using platform::BackgroundActivityResult;
using platform::Duration;

namespace {

constexpr Duration atOnce{0.0};
// A delay that rounding leaves could be so small that virtual time would never pass.
constexpr Duration timerResolution{1e-6};

}  // namespace

// A boot is identified by its number. One clock counts through all boots and serves as the clock of each.
platform::Moment BackgroundActivities::now() const {
    return {std::to_string(boot_), clock_.elapsed(), clock_.now()};
}

void BackgroundActivities::schedule(const platform::ActivityRegistration& registration, ActivityHandler handler) {
    interference_.call();
    Attachment& attachment = attachments_[registration.identifier];
    attachment.handler.swap(handler);  // the old handler is released at the end
    if (!registration.isPreregistered) {
        ActivityCriteria criteria = registration.criteria.value_or(ActivityCriteria());
        Duration interval = registration.isByOwnRun ? minimumInterval_ : atOnce;
        attachment.isRegisteredByOwnRun = registration.isByOwnRun && criteria.delay <= 0;
        platform::DueTime due = platform::dueTime(criteria, interval, now());
        if (shareOfGrace_ > 0)
            due = platform::dueAfter(due.wait + Duration(shareOfGrace_ * static_cast<double>(criteria.gracePeriod)),
                                     now());
        const auto earlier = rows_.find(registration.identifier);
        if (earlier != rows_.end() && isAfterBoot()) due = platform::takenUp(due, earlier->second.due, now());
        addRow(registration.identifier, criteria, std::move(due));
    }
    considerLater(registration.identifier, atOnce);
}

void BackgroundActivities::addRow(const std::string& identifier, const ActivityCriteria& criteria,
                                  platform::DueTime due) {
    plantDefect(due);
    rows_[identifier] = {criteria, std::move(due), ++lastGeneration_};
}

void BackgroundActivities::plantDefect(platform::DueTime& due) const {
    constexpr Duration day{86400};
    if (due.wait > day && interference_.strikes(Defect::FiringEarly)) due = platform::dueAfter(due.wait / 2, now());
    if (interference_.strikes(Defect::FiringLate)) due = platform::dueAfter(due.wait + day, now());
}

void BackgroundActivities::setNetworkAvailable(bool isNetworkAvailable) {
    isNetworkAvailable_ = isNetworkAvailable;
    considerAll();
}

void BackgroundActivities::setShouldDefer(bool shouldDefer) {
    shouldDefer_ = shouldDefer;
    considerAll();
}

void BackgroundActivities::setNetworkMetered(bool isNetworkMetered) {
    isNetworkMetered_ = isNetworkMetered;
    considerAll();
}

bool BackgroundActivities::shouldDefer(std::string_view identifier) const {
    const auto running = attachments_.find(identifier);
    return shouldDefer_ || (isNetworkMetered_ && running != attachments_.end() && running->second.doesRunNeedNetwork);
}

void BackgroundActivities::processStarted(const std::string& agentVersion) {
    for (auto& [identifier, row] : rows_)
        if (std::exchange(row.isInterrupted, false))
            row.due = platform::dueAfter(platform::retryDelay(++row.deferrals), now());
    const auto due = platform::dueAfter(atOnce, now());
    if (std::exchange(lastVersion_, agentVersion) != agentVersion)
        addRow(platform::vendorIdentifier(platform::upgradeActivityRemainder), {}, due);
    if (std::exchange(isBootActivityOwed_, false))
        addRow(platform::vendorIdentifier(platform::bootActivityRemainder), {}, due);
    considerAll();
}

void BackgroundActivities::processEnded() {
    platform::ShutdownScope shutdown;
    factory_ = nullptr;
    for (auto& [identifier, row] : rows_) {
        const auto attachment = attachments_.find(identifier);
        row.isInterrupted = attachment != attachments_.end() && attachment->second.runningGeneration == row.generation;
    }
    attachments_.clear();
    looks_.clear();
}

void BackgroundActivities::booted() {
    for (auto row = rows_.begin(); row != rows_.end();) {
        Row& stored = row->second;
        if (interference_.strikes(Defect::ClockNotCarried))
            stored.due =
                platform::dueAfter(stored.due.wait, {std::to_string(boot_ + 1), clock_.elapsed(), clock_.now()});
        row = interference_.strikes(Defect::RowForgotten) ? rows_.erase(row) : std::next(row);
    }
    ++boot_;
    isBootActivityOwed_ = true;
}

void BackgroundActivities::takeOver(const std::string& identifier, const Registered& registered) {
    rows_[identifier] = {.criteria = registered.criteria,
                         .due = platform::dueAfter(registered.timeLeft, now()),
                         .generation = ++lastGeneration_,
                         .deferrals = registered.deferrals,
                         .isInterrupted = registered.isInterrupted};
}

void BackgroundActivities::takeOverFired(std::string agentVersion, bool isBootActivityFired) {
    lastVersion_ = std::move(agentVersion);
    isBootActivityOwed_ = !isBootActivityFired;
}

std::vector<std::string> BackgroundActivities::registered() const {
    std::vector<std::string> identifiers;
    for (const auto& [identifier, row] : rows_) identifiers.push_back(identifier);
    return identifiers;
}

std::optional<ActivityCriteria> BackgroundActivities::criteria(const std::string& identifier) const {
    auto row = rows_.find(identifier);
    return row == rows_.end() ? std::nullopt : std::optional(row->second.criteria);
}

std::optional<Duration> BackgroundActivities::timeLeft(const std::string& identifier) const {
    auto row = rows_.find(identifier);
    return row == rows_.end() ? std::nullopt : std::optional(platform::timeLeft(row->second.due, now()));
}

bool BackgroundActivities::isRunning() const {
    return std::ranges::any_of(attachments_,
                               [](const auto& entry) { return entry.second.runningGeneration.has_value(); });
}

int BackgroundActivities::firingCount(std::string_view identifier) const {
    return static_cast<int>(std::ranges::count(firings_, identifier, &Firing::identifier));
}

void BackgroundActivities::considerAll() {
    for (const auto& [identifier, row] : rows_) considerLater(identifier, atOnce);
}

void BackgroundActivities::considerLater(const std::string& identifier, Duration delay) {
    // An earlier look that is to come asks again itself.
    std::set<Duration>& looks = looks_[identifier];
    const Duration when = clock_.elapsed() + delay;
    if (!looks.empty() && *looks.begin() <= when && delay > atOnce) return;
    if (!looks.insert(when).second) return;
    lane_->postAfter(delay, [this, identifier, when] {
        looks_[identifier].erase(when);
        consider(identifier);
    });
}

// Whether the boot activity is under way.
bool BackgroundActivities::isAfterBoot() const {
    const auto boot = attachments_.find(platform::vendorIdentifier(platform::bootActivityRemainder));
    return boot != attachments_.end() && boot->second.runningGeneration.has_value();
}

// Whether an activity has to wait until the boot activity has taken up what was scheduled before the boot.
bool BackgroundActivities::isHeldForBoot(const std::string& identifier) {
    const std::string boot = platform::vendorIdentifier(platform::bootActivityRemainder);
    return platform::waitsForBootActivity(identifier) && rows_.contains(boot) && attachments_[boot].handler;
}

// Called whenever something may have changed: a firing's time may have come, or the activity may be gone.
void BackgroundActivities::consider(const std::string& identifier) {
    auto row = rows_.find(identifier);
    if (row == rows_.end() || attachments_[identifier].runningGeneration || isHeldForBoot(identifier)) return;
    row->second.due = platform::carriedOver(row->second.due, now());  // the wall clock may have been set
    const bool doesDefer = shouldDefer_ || (isNetworkMetered_ && row->second.criteria.requiresNetwork);
    auto decision =
        platform::decideFiring(row->second.due, row->second.criteria, now(), isNetworkAvailable_, doesDefer);
    if (decision.isFired)
        fire(identifier, row->second.generation);
    else if (decision.askAgainIn)
        considerLater(identifier, std::max(*decision.askAgainIn, timerResolution));
}

void BackgroundActivities::fire(const std::string& identifier, int generation) {
    Attachment& attachment = attachments_[identifier];
    if (!attachment.handler && factory_) attachment.handler = factory_(identifier);
    if (!attachment.handler) return;  // waits until a process attaches a handler
    if (interference_.strikes(Defect::FiringLost)) {
        rows_.erase(identifier);
        return;
    }
    attachment.runningGeneration = generation;
    attachment.doesRunNeedNetwork = rows_.at(identifier).criteria.requiresNetwork;
    firings_.push_back({identifier, clock_.now()});
    if (firingObserver_) firingObserver_(identifier);
    const CauseScope cause(queues_, identifier);
    ActivityHandler handler = attachment.handler;  // another handler may take its place during the run
    if (interference_.strikes(Defect::HandlerTwice)) handler([](BackgroundActivityResult) {});
    handler([this, identifier](BackgroundActivityResult result) { takeResult(identifier, result); });
}

void BackgroundActivities::takeResult(const std::string& identifier, BackgroundActivityResult result) {
    Attachment& attachment = attachments_[identifier];
    const int ranGeneration = *std::exchange(attachment.runningGeneration, std::nullopt);
    const bool isByOwnRun = std::exchange(attachment.isRegisteredByOwnRun, false);
    auto entry = rows_.find(identifier);
    if (entry == rows_.end()) return;
    Row& row = entry->second;
    if (row.generation != ranGeneration)  // registered during the run
        row.due = platform::noSoonerThan(row.due, isByOwnRun ? minimumInterval_ : atOnce, now());
    else if (interference_.planted == Defect::FiringAgain)
        row.due = platform::dueAfter(platform::firingMargin, now());
    else if (result == BackgroundActivityResult::Finished)
        rows_.erase(entry);
    else
        row.due = platform::dueAfter(platform::retryDelay(++row.deferrals), now());
    considerAll();  // other activities may have waited for this run
}

}  // namespace vrx::sim
