// The world around the agent: a simulated host, the user's devices, their records and the servers, all of which the
// events of a life change. It knows nothing of what the agent should make of them.
#pragma once

#include <deque>
#include <map>
#include <optional>
#include <set>
#include <string>
#include <string_view>
#include <tuple>
#include <vector>

#include "vrx/sim/host.h"
#include "vrxsim/life.h"

namespace vrx::simulation {

inline const std::string phone = "PHONE";

// What the server knows of a device. Days count from the beginning of the life.
struct Record {
    std::optional<double> shownFrom{}, until{}, daysBeforeEnd{};
    bool isOffered = false;
    std::string excludedCarrier{};
    int version = 0;       // counts the records that there were, of all devices
    double changedAt = 0;  // elapsed seconds

    bool saysTheSameAs(const Record& other) const {
        return version > 0 &&
               std::tie(shownFrom, until, daysBeforeEnd, isOffered, excludedCarrier) ==
                   std::tie(other.shownFrom, other.until, other.daysBeforeEnd, other.isOffered, other.excludedCarrier);
    }
};

// What the server answered: a record as it was then, in a language. It carries its number, counted from 1, so that one
// sees what an item or a file was made of. 0 is an answer without a number, which offers nothing.
struct Answer {
    std::string serialNumber{};
    Record record{};
    std::string language{};
};

class World {
public:
    static constexpr int secondsVersionsAreKept = 300;  // by the document's own headers

    World();

    // Lets an event happen that is none of the process or its clients. Returns false for any other.
    bool happen(const Event& event);

    double elapsed() const { return host.clock.elapsed().count(); }
    std::vector<platform::FollowUpItem>& items();
    bool isPaired(const std::string& serialNumber) const;
    // The latest end of all offers that any server's record ever named for the device; null without any.
    std::optional<platform::Date> latestEnd(const std::string& serialNumber) const;
    // The title that the server gives a follow-up in a language.
    static std::string title(const std::string& language) { return "Offer " + language; }
    // The label of an item's action that was made of an answer, and the number in such a text; 0 without any.
    static std::string label(int answer) { return "Answer " + std::to_string(answer) + "."; }
    static int answerIn(std::string_view text);
    const Answer& answer(int number) const { return answers_[static_cast<std::size_t>(number)]; }
    // The present record of a device; null when the server has none.
    const Record* record(const std::string& serialNumber) const;
    bool hasCarrier(const std::string& code) const;
    // Whether the machine and the server allow for watches at all.
    bool areWatchesSupported() const;
    // The moment of a day of the life on the wall clock that was right at its beginning.
    static platform::Date dateOf(double days) { return sim::Clock::start + platform::Duration(secondsOfDay * days); }

    // How far ahead the wall clock is.
    platform::Duration clockOffset() const { return host.clock.now() - (sim::Clock::start + host.clock.elapsed()); }

    // Whether something may keep the agent from its work: no network, deferral, a failure that is still to come.
    bool isTroubled() const;
    bool isFailing() const;
    // Whether the servers have answered as they should at least since then, for a signed-in user, and nothing is kept
    // of what they said before.
    bool isServerFineSince(double second) const {
        return isServerFine() && serverTroubledAt_ + secondsVersionsAreKept < second;
    }

    sim::Host host;
    std::map<std::string, double> unpairedAt;  // elapsed seconds; of watches that are not paired now
    std::map<std::string, double> pairedAt;    // of those that are
    std::set<std::string> everKnown{phone};    // serial numbers of all devices and records
    double languageChangedAt = 0;
    double machineChangedAt = 0;  // when trouble last began or ended
    double clockSetAt = -1;       // below 0: never
    double pairedDevicesChangedAt = 0;
    bool hasTestSettings = false;  // that change what the agent takes for its devices or dates
    int failures = 0;              // how often something was made to fail
    bool hasFailed = false;        // a write of settings was ever made to fail
    bool hadOldLayout = false;

private:
    void takeRecord(const std::string& serialNumber, Record record);
    void setRecord(const std::vector<std::string>& words);
    void pair(const std::string& serialNumber, const std::string& day);
    void unpair(const std::string& serialNumber);
    void setClock(double seconds);
    void setSetting(const std::string& key, platform::Value value);
    void fail(const std::string& what, int count);
    void makeOldLayout(double until);
    bool isServerFine() const;
    bool changeDevice(const Event& event);
    bool changeMachine(const Event& event);
    bool changeServers(const Event& event);

    // Of a new answer.
    platform::Dictionary coverage(const std::string& serialNumber, const Record& record, const std::string& language);
    sim::HttpAnswer answer(const platform::HttpRequest& request);
    sim::HttpAnswer versionsAnswer(const platform::HttpRequest& request);
    std::optional<sim::HttpAnswer> troubledAnswer(std::deque<std::string>& troubles, const std::string& fine);
    static sim::HttpAnswer answerOfKind(const std::string& kind, const std::string& fine);

    std::map<std::string, Record> records_;
    int lastVersion_ = 0;
    std::vector<Answer> answers_{Answer()};                     // by their numbers
    std::map<std::string, double> latestEnds_;                  // days
    std::deque<std::string> serverTroubles_, versionTroubles_;  // the kinds of the next answers
    std::string outage_;                                        // the kind of all answers; empty without one
    double serverTroubledAt_ = -1;                              // the last time that an event changed how it answers
    std::int64_t lowVersion_ = 2, highVersion_ = 3;
    bool isNetworkOn_ = true, isMetered_ = false, isDeferring_ = false;
};

}  // namespace vrx::simulation
