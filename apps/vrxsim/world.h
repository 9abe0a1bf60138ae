// The world around the agent: a simulated host, the user's devices, their records and the servers, all of which the
// events of a life change. It knows nothing of what the agent should make of them.
#pragma once

#include <deque>
#include <map>
#include <optional>
#include <set>
#include <string>

#include "vrx/sim/host.h"
#include "vrxsim/life.h"

namespace vrx::simulation {

inline const std::string phone = "PHONE";

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
    struct Record {
        std::optional<double> shownFrom, until, daysBeforeEnd;
        bool isOffered = true;
        std::string excludedCarrier;
    };

    void takeRecord(const std::string& serialNumber, const Record& record);
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

    platform::Dictionary coverage(const Record& record, const std::string& language) const;
    sim::HttpAnswer answer(const platform::HttpRequest& request);
    sim::HttpAnswer versionsAnswer(const platform::HttpRequest& request);
    std::optional<sim::HttpAnswer> troubledAnswer(std::deque<std::string>& troubles, const std::string& fine);
    static sim::HttpAnswer answerOfKind(const std::string& kind, const std::string& fine);

    std::map<std::string, Record> records_;
    std::map<std::string, double> latestEnds_;                  // days
    std::deque<std::string> serverTroubles_, versionTroubles_;  // the kinds of the next answers
    std::string outage_;                                        // the kind of all answers; empty without one
    double serverTroubledAt_ = -1;                              // the last time that an event changed how it answers
    std::int64_t lowVersion_ = 2, highVersion_ = 3;
    bool isNetworkOn_ = true, isMetered_ = false, isDeferring_ = false;
};

}  // namespace vrx::simulation
