// What must always hold of what the agent leaves behind, whatever happens to it, stated by what can be seen from
// outside: follow-ups, settings, files, registrations and runs. docs/simulation.md lists it.
#pragma once

#include <map>
#include <optional>
#include <set>
#include <string>
#include <vector>

#include "vrxsim/clients.h"
#include "vrxsim/verdict.h"
#include "vrxsim/world.h"

namespace vrx::simulation {

class Invariants {
public:
    Invariants(World& world, Clients& clients, Verdict& verdict)
        : world_(world), clients_(clients), verdict_(verdict) {}

    // To be called at each start of the process, and when it ended in the midst of a task.
    void processStarted();
    void processWasCutShort();
    // To be called after each event, and now and then, before the host's records are forgotten.
    void check();
    // On how many days each activity ran again and again, as often as it can.
    const std::map<std::string, std::int64_t>& restlessDays() const { return restlessDays_; }

private:
    void report(const char* rule, std::string detail);
    void noteTrouble();
    void checkItems();
    void checkShownItems();
    void checkToldItems();
    void checkDismissals();
    void checkFiles();
    void checkTargetDates();
    void checkTargetDate(const std::string& activity, platform::Date date);
    void checkRuns();
    void checkGrowth();
    bool isCalmSince(double second) const { return calmSince_ <= second; }

    struct Overdue {
        platform::Date date{};
        double since = 0;
    };

    World& world_;
    Clients& clients_;
    Verdict& verdict_;
    double calmSince_ = 0;
    double filesCalmSince_ = 0;
    bool wereFilesFailing_ = false;
    bool mayDatesBeStray_ = false;  // a task was cut short, a write failed, or the clock was set since the last check
    bool mayDatesBeOff_ = false;    // the same, ever
    double lastClockSet_ = -1;
    bool wasFailing_ = false;
    std::vector<std::string> shown_;                 // identifiers of the items that the service acknowledged
    std::map<std::string, platform::Date> excused_;  // target dates that may be without a registration
    std::map<std::string, Overdue> overdue_;
    std::map<std::string, std::map<std::int64_t, int>> runs_;  // by activity and day, of two days
    std::map<std::string, std::int64_t> restlessDays_;
    std::map<std::string, int> unfiredRuns_;
    std::map<std::int64_t, int> admitted_;  // by day: what may cause a run besides the agent itself
    int outreaches_ = 0;
    double pairedDevicesChangedAt_ = 0;
};

}  // namespace vrx::simulation
