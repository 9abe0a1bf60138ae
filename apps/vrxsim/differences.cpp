#include "vrxsim/differences.h"

#include <algorithm>
#include <cmath>

#include "vrx/platform/vendor.h"

namespace vrx::simulation {

using platform::Date;
using platform::Duration;

namespace {

constexpr std::string_view firstDays = "first-days", beforeOutreach = "before-outreach",
                           offerAfterOutreach = "offer-after-outreach", failedLook = "failed-look",
                           signedOut = "signed-out", languageChange = "language-change", pairedAgain = "paired-again",
                           offerRenewed = "offer-renewed", takenBack = "taken-back", watchesOff = "watches-off",
                           carrierAtOutreach = "carrier-at-outreach", daysBeforeEnd = "days-before-end",
                           noEnd = "no-end", dueAtPairing = "due-at-pairing", unseenRecord = "unseen-record",
                           refreshWaits = "refresh-waits", displayMoved = "display-moved", lastDay = "last-day",
                           olderLayout = "older-layout", wrongClock = "wrong-clock", failedWrite = "failed-write",
                           strangeAnswer = "strange-answer", refused = "refused", dismissalLost = "dismissal-lost",
                           failedRead = "failed-read", pairingCutShort = "pairing-cut-short",
                           failedListing = "failed-listing", noActivation = "no-activation", clockSet = "clock-set",
                           planCutShort = "plan-cut-short";

constexpr Duration clockTolerance{60};
constexpr std::string_view post = ".vrxagent.followuppost", refresh = ".vrxagent.followuprefresh";

}  // namespace

std::span<const NamedDifference> namedDifferences() {
    static constexpr NamedDifference all[] = {
        {firstDays, "for two days after its activation a device is offered nothing"},
        {beforeOutreach, "nothing is offered before the first outreach, two days after the agent's first start"},
        {offerAfterOutreach, "the offer came, or moved, after the last run that plans posts had asked for it"},
        {failedLook,
         "a download failed where the run finishes all the same, or where an item is removed for want of it"},
        {signedOut, "the user was signed out when the record was needed; without an account none counts"},
        {languageChange, "the record in the cache was in another language, and none could be downloaded"},
        {failedRead, "the record in the cache could not be read, and the item was removed for want of it"},
        {strangeAnswer, "the server once answered with an object that makes no offer"},
        {pairedAgain, "a watch was paired again, and what was posted once gets no date"},
        {offerRenewed, "an offer ended or was withdrawn and came again, and what was posted once gets no date"},
        {takenBack, "a dismissal was taken back, and nothing posts the item again"},
        {watchesOff, "the flag or the server's version for watches went off or on, of which nothing tells the agent"},
        {carrierAtOutreach,
         "the carrier is asked only by an outreach, and has changed since, or the item was there before"},
        {daysBeforeEnd, "a record that names no day to show it from gets no date beside another device's"},
        {noEnd, "a record without an end, of another device, takes the date away"},
        {dueAtPairing, "a watch whose offer is due when it is paired gets no date: only days ahead count"},
        {pairingCutShort, "the agent was killed before it had looked after a pairing or an unpairing"},
        {unseenRecord, "the server's record has changed, and nobody has asked for it since"},
        {refreshWaits,
         "a new record came outside of the refreshes, and waits for the one that the older record has set"},
        {displayMoved, "the day to show it from moved ahead while it is shown: it stays, and its text stands still"},
        {lastDay, "in an offer's last day its end sets no date where another device's sets one"},
        {noActivation, "a watch without a pairing date sets no date for refreshes"},
        {olderLayout, "an item of the older layout is taken over as it is, and no refresh is planned for it"},
        {failedWrite, "a write of the record failed, and its date and language were written all the same"},
        {failedListing, "a listing failed, so that a refresh saw no item, and planned no other"},
        {refused, "the follow-up service refused a post, an update or a clear, which is not tried again"},
        {dismissalLost,
         "a dismissal was not stored, because the service or the settings failed or the agent was killed"},
        {wrongClock, "the clock was wrong when the activation was stored, or is now"},
        {planCutShort, "the agent was killed before it had planned the next post or refresh"},
        {clockSet, "the clock was set after the run was planned, which waits as long as before"},
    };
    return all;
}

std::optional<Way> Differences::wayOf(const std::string& serialNumber, Date moment) const {
    const std::optional<Wish> wish = wishFor(world_, serialNumber, dismissed_.contains(serialNumber), moment);
    const auto item = rules_.items().find(serialNumber);
    if (item == rules_.items().end()) return wish ? std::optional(Way::Missed) : std::nullopt;
    if (!wish) return Way::Needless;
    const bool isTextRight =
        item->second.title == World::title(wish->language) && Rules::numberIn(item->second.footer) == wish->days;
    return isTextRight ? std::nullopt : std::optional(Way::OldText);
}

void Differences::judge() {
    const double now = world_.elapsed();
    if (now <= judgedUntil_) return;
    if (world_.isTroubled()) quietSince_ = now;
    quietSince_ = std::max({quietSince_, world_.machineChangedAt, world_.clockSetAt});
    if (world_.hasTestSettings) return open_.clear();
    // Between the two nothing has changed, so that any moment will do that is at neither end.
    const Date moment = world_.host.clock.now() - Duration((now - judgedUntil_) / 2);
    for (const std::string& serialNumber : world_.everKnown) judge(serialNumber, moment, now);
    judgedUntil_ = now;
}

void Differences::judge(const std::string& serialNumber, Date moment, double now) {
    const std::optional<Way> way = wayOf(serialNumber, moment);
    const auto known = open_.find(serialNumber);
    if (!way) {
        if (known != open_.end()) open_.erase(known);
        return;
    }
    if (known == open_.end() || known->second.way != *way) open_[serialNumber] = {*way, judgedUntil_, judgedUntil_};
    Open& open = open_[serialNumber];
    const double since = std::max(open.since, quietSince_);
    if (now - since <= patience) return;
    std::string_view name = nameOf(serialNumber, *way, moment);
    // Where one cause follows another, a run that does something about it is to be expected: until then the first
    // lasts.
    const bool isNew = name != open.name && now - std::max(open.namedAt, quietSince_) > patience;
    if (isNew || name == open.name || open.name.empty())
        open.namedAt = now;
    else
        name = open.name;
    open.name = name;
    if (name.empty()) {
        constexpr std::string_view what[] = {"is not shown", "is shown", "is shown with old texts"};
        verdict_.report(now / secondsOfDay, "unnamed",
                        "the item of " + serialNumber + " " + std::string(what[static_cast<int>(*way)]) +
                            " for no known cause since day " + wordFor(since / secondsOfDay));
        return;
    }
    found_[name][static_cast<std::size_t>(*way)] += now - std::max(since, open.judgedUntil);
    open.judgedUntil = now;
}

DifferentSeconds Differences::found() const {
    DifferentSeconds seconds;
    for (const auto& [name, found] : found_)
        for (std::size_t way = 0; way < ways; ++way) seconds[name][way] = std::llround(found[way]);
    return seconds;
}

std::optional<double> Differences::nextMoment() const {
    const Date now = world_.host.clock.now();
    std::optional<double> next;
    for (const std::string& serialNumber : world_.everKnown)
        if (const std::optional<Date> change = nextChangeOfWish(world_, serialNumber, now)) {
            const double at = std::max(world_.host.clock.elapsedAt(*change).count(), world_.elapsed() + 1);
            if (!next || at < *next) next = at;
        }
    return next;
}

std::string_view Differences::nameOf(const std::string& serialNumber, Way way, Date moment) const {
    if (way == Way::Missed) return nameOfMissed(serialNumber, moment);
    const ShownItem& item = rules_.items().at(serialNumber);
    return way == Way::Needless ? nameOfNeedless(serialNumber, item, moment) : nameOfOldText(serialNumber, item);
}

std::string_view Differences::nameOfMissed(const std::string& serialNumber, Date moment) const {
    const Record& record = *world_.record(serialNumber);
    if (const std::optional<Date> activation = rules_.activation(serialNumber)) {
        const Date trueMoment = moment - world_.clockOffset();
        if (*activation + rules_.outreachDelay() > moment) {
            const bool isClockWrong = *activation > trueMoment + clockTolerance ||
                                      *activation + rules_.outreachDelay() < trueMoment - clockTolerance;
            return isClockWrong ? wrongClock : firstDays;
        }
    }
    const Removal* const removal = rules_.removal(serialNumber);
    const PlannersView* const plan = rules_.planned(serialNumber);
    if (removal && !(plan && plan->run == PlannersView::Run::Post && plan->at > removal->at))
        return nameOfRemoval(*removal, record);
    const auto pairedAt = world_.pairedAt.find(serialNumber);
    const bool isNewSincePlan = pairedAt != world_.pairedAt.end() && (!plan || plan->at < pairedAt->second);
    if (isNewSincePlan && rules_.wasPairingCutShort(pairedAt->second)) return pairingCutShort;
    const double* const leftOutAt = rules_.leftOutAt(serialNumber);
    if (leftOutAt && (!plan || *leftOutAt > plan->at)) return watchesOff;
    if (!plan) return rules_.lastOutreachAt() < 0 ? beforeOutreach : "";
    const std::string_view name = nameByPlan(*plan, record);
    if (!name.empty() || plan->run == PlannersView::Run::Outreach) return name;
    return removal && plan->wasPosted ? nameOfRemoval(*removal, record) : "";
}

std::string_view Differences::nameOfLack(const Found& found) const {
    switch (found.lack) {
        case Found::Lack::Failed: return failedLook;
        case Found::Lack::SignedOut: return signedOut;
        case Found::Lack::OtherLanguage: return languageChange;
        case Found::Lack::Unreadable: return failedRead;
        case Found::Lack::NotKept: return failedWrite;
        default: return "";
    }
}

std::string_view Differences::nameOfRemoval(const Removal& removal, const Record& record) const {
    using enum Removal::Cause;
    switch (removal.cause) {
        case NoRecord: return nameOfLack(removal.found);
        case Unpaired: return pairedAgain;
        case Unsupported: return watchesOff;
        case Dismissed: return takenBack;
        case NoOffer:
        case Ended: break;
    }
    if (removal.found.answer == 0) return strangeAnswer;
    const bool wasClockWrong = std::abs(removal.clockOffset.count()) > clockTolerance.count();
    if (removal.cause == Ended && wasClockWrong) return wrongClock;
    if (record.changedAt > removal.at) return offerRenewed;
    return record.saysTheSameAs(world_.answer(removal.found.answer).record) ? "" : unseenRecord;
}

std::string_view Differences::nameByPlan(const PlannersView& plan, const Record& record) const {
    if (!plan.found.isRecord()) return record.changedAt > plan.at ? offerAfterOutreach : nameOfLack(plan.found);
    if (plan.found.answer == 0) return strangeAnswer;
    if (!record.saysTheSameAs(world_.answer(plan.found.answer).record)) return offerAfterOutreach;
    if (plan.isDismissed) return takenBack;
    if (plan.isExcluded) return carrierAtOutreach;
    if (plan.wasRefused) return refused;
    if (world_.clockSetAt > plan.at) return clockSet;
    if (rules_.wasPostPlanCutShort() && !isPlanned(post)) return planCutShort;
    if (plan.run == PlannersView::Run::Outreach) return "";
    if (!record.shownFrom) return daysBeforeEnd;
    if (plan.isDateTakenAway) return noEnd;
    return plan.isDue && plan.run == PlannersView::Run::Pairing ? dueAtPairing : "";
}

std::string_view Differences::nameOfNeedless(const std::string& serialNumber, const ShownItem& item,
                                             Date moment) const {
    const Record* const record = world_.record(serialNumber);
    if (dismissed_.contains(serialNumber)) return rules_.isDismissalStored(serialNumber) ? "" : dismissalLost;
    if (item.hasRequestFailed) return refused;
    if (serialNumber != phone && !world_.isPaired(serialNumber)) {
        const double unpairedAt = world_.unpairedAt.at(serialNumber);
        if (rules_.listingFailedAt() >= unpairedAt) return failedListing;
        return rules_.wasPairingCutShort(unpairedAt) ? pairingCutShort : "";
    }
    if (serialNumber != phone && !world_.areWatchesSupported()) return watchesOff;
    if (!record || !record->saysTheSameAs(world_.answer(item.answer).record))
        return nameOfOldRecord(serialNumber, item);
    if (world_.hasCarrier(record->excludedCarrier)) return carrierAtOutreach;
    if (item.isFromOlderLayout && !isPlanned(refresh)) return olderLayout;
    if (offeredFrom(*record) > moment) return displayMoved;
    return nameByRefreshes(serialNumber, item);
}

// Why no refresh brings an item up to date.
std::string_view Differences::nameByRefreshes(const std::string& serialNumber, const ShownItem& item) const {
    if (item.hasRequestFailed) return refused;
    if (rules_.listingFailedAt() >= item.filledAt) return failedListing;
    if (world_.clockSetAt > item.filledAt) return clockSet;
    if (!isPlanned(refresh)) {
        if (rules_.endOfRefreshes() == Rules::EndOfRefreshes::FailedListing) return failedListing;
        if (rules_.endOfRefreshes() == Rules::EndOfRefreshes::RefusedClear) return refused;
        if (item.isRunCutShort || rules_.wasRefreshPlanCutShort()) return planCutShort;
        return item.isFromOlderLayout ? olderLayout : "";
    }
    const RefreshView* const plan = rules_.refreshed(serialNumber);
    if (!plan) return "";
    if (world_.clockSetAt > plan->at) return clockSet;
    const Record& record = world_.answer(item.answer).record;
    if (!plan->found.isRecord()) return nameOfLack(plan->found);
    if (!record.saysTheSameAs(world_.answer(plan->found.answer).record)) return refreshWaits;
    if (plan->isDisplayAhead) return displayMoved;
    if (plan->daysLeft <= 1) return lastDay;
    return plan->hasNoActivation ? noActivation : "";
}

bool Differences::isPlanned(std::string_view activity) const {
    return world_.host.activities.timeLeft(platform::vendorIdentifier(activity)).has_value();
}

// Why an item is still filled from a record that is not the present one.
std::string_view Differences::nameOfOldRecord(const std::string& serialNumber, const ShownItem& item) const {
    const Record* const record = world_.record(serialNumber);
    const Download* const last = rules_.downloaded(serialNumber);
    if (!record || !last || !record->saysTheSameAs(world_.answer(last->answer).record)) return unseenRecord;
    return nameOfOldAnswer(serialNumber, item);
}

// Why an item is filled from another answer than the one that was downloaded last.
std::string_view Differences::nameOfOldAnswer(const std::string& serialNumber, const ShownItem& item) const {
    const Download* const last = rules_.downloaded(serialNumber);
    if (rules_.isCacheBehind(serialNumber)) return failedWrite;
    if (!last || item.answer >= last->answer || last->at < item.filledAt) return "";
    if (item.hasRequestFailed) return refused;
    if (rules_.listingFailedAt() >= last->at) return failedListing;
    return isPlanned(refresh) ? refreshWaits : nameByRefreshes(serialNumber, item);
}

std::string_view Differences::nameOfOldText(const std::string& serialNumber, const ShownItem& item) const {
    if (!world_.record(serialNumber)->saysTheSameAs(world_.answer(item.answer).record))
        return nameOfOldRecord(serialNumber, item);
    const Answer& answer = world_.answer(item.answer);
    if (answer.language != world_.host.locale.identifier) {
        if (world_.languageChangedAt > item.filledAt) return languageChange;
        return nameOfOldAnswer(serialNumber, item);
    }
    return nameByRefreshes(serialNumber, item);
}

}  // namespace vrx::simulation
