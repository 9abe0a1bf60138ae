#include "timeline/timeline_text.h"

#include <algorithm>
#include <cmath>

#include "common/command_line.h"

namespace vrx::timeline {

using apps::printable;
using apps::table;
using platform::Date;
using Rows = std::vector<std::vector<std::string>>;

namespace {

constexpr platform::Duration shortPlay{2.0 * 3600};

// Dates of one play: with seconds where minutes would not tell them apart.
class Dates {
public:
    explicit Dates(const Chronicle& chronicle) : hasSeconds_(chronicle.until - chronicle.from < shortPlay) {}

    std::string operator()(Date date) const {
        constexpr std::size_t minutesEnd = 16;
        std::string text = apps::dateText(date);
        if (!hasSeconds_ || text.size() < minutesEnd) return text;
        const auto second = static_cast<int>(std::fmod(std::floor(platform::epochSeconds(date)), 60.0));
        const std::string digits = std::to_string(std::abs(second));
        return text.insert(minutesEnd, (digits.size() < 2 ? ":0" : ":") + digits);
    }
    std::string operator()(const std::optional<Date>& date, const char* otherwise) const {
        return date ? (*this)(*date) : otherwise;
    }

private:
    const bool hasSeconds_;
};

std::string heading(const DeviceLane& lane) {
    if (lane.serialNumber.empty()) return "An item that names no device";
    return (lane.name ? printable(*lane.name) + ", " : "") + printable(lane.serialNumber);
}

std::vector<std::string> rowOf(const Shown& shown, const Shown* before, const Dates& dates) {
    const bool isTitleNew = !before || before->title != shown.title;
    std::string text = isTitleNew && !shown.title.empty() ? shown.title + (shown.text.empty() ? "" : ": ") : "";
    text += shown.text + (shown.isExpired ? " (expired)" : "");
    return {"", dates(shown.from), dates(shown.until, "the end"), shown.hasBadge ? "badge" : "", text};
}

std::string shownText(const DeviceLane& lane, const Dates& dates) {
    if (lane.shown.empty()) return "  Nothing is shown.\n";
    Rows rows{{"", "SHOWN FROM", "UNTIL", "", "TEXT"}};
    constexpr std::size_t readable = 60, kept = 20;  // of more than that, so many at both ends
    const std::size_t count = lane.shown.size();
    for (std::size_t at = 0; at < count; ++at) {
        if (count > readable && at == kept) {
            at = count - kept;
            rows.push_back({"", std::to_string(count - 2 * kept) + " more", "", "", "…"});
        }
        rows.push_back(rowOf(lane.shown[at], at > 0 ? &lane.shown[at - 1] : nullptr, dates));
    }
    return table(rows, apps::Fit::BreakLast);
}

std::string textOf(const DeviceLane& lane, const Dates& dates) {
    std::string text = apps::coloured(heading(lane), apps::Colour::Bold) + "\n";
    Rows facts;
    if (lane.activation) facts.push_back({"", "Activated", dates(*lane.activation)});
    if (lane.coverageEnd) facts.push_back({"", "Covered until", dates(*lane.coverageEnd)});
    for (const Offer& offer : lane.offers)
        facts.push_back({"", "Offer", dates(offer.from, "?") + " to " + dates(offer.until)});
    if (lane.isDismissed) facts.push_back({"", "Dismissed", "its follow-up stays away"});
    return text + table(facts, apps::Fit::BreakLast) + shownText(lane, dates);
}

// All of few; of many the first ones and the last.
std::string runsText(const std::vector<Date>& runs, const Dates& dates) {
    constexpr std::size_t few = 3;
    if (runs.empty()) return "does not run";
    std::string text;
    for (std::size_t at = 0; at < std::min(few, runs.size()); ++at) text += (at > 0 ? ", " : "") + dates(runs[at]);
    if (runs.size() <= few) return text;
    const std::size_t between = runs.size() - few - 1;
    return text + (between > 0 ? ", " + std::to_string(between) + " more" : "") + ", " + dates(runs.back());
}

}  // namespace

std::string assumptionsText(const Chronicle& chronicle) {
    if (chronicle.assumptions.empty()) return "";
    Rows assumptions;
    for (const std::string& assumption : chronicle.assumptions) assumptions.push_back({"", "-", assumption});
    return "Assumed:\n" + table(assumptions, apps::Fit::BreakLast);
}

std::string textOf(const Chronicle& chronicle) {
    const Dates dates(chronicle);
    std::string text = "From " + dates(chronicle.from) + " to " + dates(chronicle.until) +
                       (chronicle.isComplete ? "; nothing comes after that.\n" : "; more comes after that.\n");
    text += assumptionsText(chronicle);
    for (const DeviceLane& lane : chronicle.devices) text += "\n" + textOf(lane, dates);
    Rows activities{{"ACTIVITY", "LAST RUN", "RUNS"}};
    for (const ActivityLane& lane : chronicle.activities) {
        const auto& last = lane.lastRun;
        activities.push_back({lane.identifier.substr(lane.identifier.rfind('.') + 1),
                              last ? dates(last->began) + ", " + last->outcome : "never", runsText(lane.runs, dates)});
    }
    return text + "\n" + table(activities, apps::Fit::BreakLast);
}

}  // namespace vrx::timeline
