// Where what the rules give is not what is wished for: found device by device, named by its cause, and summed up. Each
// name has a condition that is checked; what none explains breaks the rule `unnamed`.
//
// A difference counts once it has lasted for `patience` in a machine without trouble: by then a run that could do
// something about it has been, as a retry waits an hour at most and a run of its own a quarter of one. What lasts that
// long is then counted from its beginning, but for what trouble lay in between. After test keys nothing is judged.
#pragma once

#include <array>
#include <cstdint>
#include <map>
#include <optional>
#include <set>
#include <span>
#include <string>
#include <string_view>

#include "vrxsim/rules.h"
#include "vrxsim/verdict.h"
#include "vrxsim/wish.h"
#include "vrxsim/world.h"

namespace vrx::simulation {

inline constexpr double patience = 2 * secondsOfHour;

enum class Way : std::uint8_t { Missed, Needless, OldText };  // not shown, shown, shown with texts of before
inline constexpr std::size_t ways = 3;

struct NamedDifference {
    std::string_view name;
    std::string_view sentence;
};
std::span<const NamedDifference> namedDifferences();

// Whole seconds by name and way. Sums of them are the same in whatever order lives end.
using DifferentSeconds = std::map<std::string_view, std::array<std::int64_t, ways>>;

class Differences {
public:
    Differences(const World& world, const Rules& rules, Verdict& verdict)
        : world_(world), rules_(rules), verdict_(verdict) {}

    void processStarts() { quietSince_ = world_.elapsed(); }
    void dismissalIsAsked(const std::string& serialNumber) { dismissed_.insert(serialNumber); }
    void dismissalsAreTakenBack() { dismissed_.clear(); }

    // To be called before anything changes, and at nextMoment(): judges the time since the last call, in which all was
    // as it is now.
    void judge();
    // The elapsed second at which a wish changes next by itself; null for none.
    std::optional<double> nextMoment() const;

    DifferentSeconds found() const;

private:
    struct Open {
        Way way = Way::Missed;
        double since = 0, judgedUntil = 0;
        std::string_view name{};  // its present one
        double namedAt = 0;       // when its cause was last seen
    };

    std::optional<Way> wayOf(const std::string& serialNumber, platform::Date moment) const;
    void judge(const std::string& serialNumber, platform::Date moment, double now);
    bool isPlanned(std::string_view activity) const;
    std::string_view nameByRefreshes(const std::string& serialNumber, const ShownItem& item) const;
    std::string_view nameOf(const std::string& serialNumber, Way way, platform::Date moment) const;
    std::string_view nameOfMissed(const std::string& serialNumber, platform::Date moment) const;
    std::string_view nameOfRemoval(const Removal& removal, const Record& record) const;
    std::string_view nameOfLack(const Found& found) const;
    std::string_view nameByPlan(const PlannersView& plan, const Record& record) const;
    std::string_view nameOfNeedless(const std::string& serialNumber, const ShownItem& item,
                                    platform::Date moment) const;
    std::string_view nameOfOldText(const std::string& serialNumber, const ShownItem& item) const;
    std::string_view nameOfOldAnswer(const std::string& serialNumber, const ShownItem& item) const;
    std::string_view nameOfOldRecord(const std::string& serialNumber, const ShownItem& item) const;

    const World& world_;
    const Rules& rules_;
    Verdict& verdict_;
    double judgedUntil_ = 0;
    double quietSince_ = 0;
    std::set<std::string> dismissed_;
    std::map<std::string, Open> open_;
    std::map<std::string_view, std::array<double, ways>> found_;
};

}  // namespace vrx::simulation
