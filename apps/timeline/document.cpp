#include "timeline/document.h"

namespace vrx::timeline {

using platform::Array;
using platform::Dictionary;
using platform::Value;

namespace {

template <class T>
Value valueOf(const std::optional<T>& value) {
    return value ? Value(*value) : Value();
}

Value documentOf(const DeviceLane& lane) {
    Array offers, shown;
    for (const Offer& offer : lane.offers)
        offers.push_back(Dictionary{{"from", valueOf(offer.from)}, {"until", offer.until}});
    for (const Shown& look : lane.shown) shown.push_back(documentOf(look));
    return Dictionary{{"serialNumber", lane.serialNumber},
                      {"name", valueOf(lane.name)},
                      {"kind", lane.kind},
                      {"dismissed", lane.isDismissed},
                      {"recordCounts", lane.hasRecord},
                      {"activationDate", valueOf(lane.activation)},
                      {"coverageEndDate", valueOf(lane.coverageEnd)},
                      {"offers", offers},
                      {"shown", shown}};
}

Value documentOf(const ActivityLane& lane) {
    Dictionary document{{"identifier", lane.identifier}, {"lastRun", nullptr}};
    if (const auto& run = lane.lastRun)
        document["lastRun"] =
            Dictionary{{"began", run->began}, {"ended", valueOf(run->ended)}, {"outcome", run->outcome}};
    document["runs"] = Array(lane.runs.begin(), lane.runs.end());
    return document;
}

}  // namespace

Value documentOf(const Shown& shown) {
    return Dictionary{{"from", shown.from},         {"until", valueOf(shown.until)},
                      {"title", shown.title},       {"text", shown.text},
                      {"action", shown.action},     {"badge", shown.hasBadge},
                      {"expired", shown.isExpired}, {"daysLeft", valueOf(shown.daysLeft)}};
}

Dictionary documentOf(const Chronicle& chronicle) {
    Array devices, activities;
    for (const DeviceLane& lane : chronicle.devices) devices.push_back(documentOf(lane));
    for (const ActivityLane& lane : chronicle.activities) activities.push_back(documentOf(lane));
    return {{"from", chronicle.from},
            {"until", chronicle.until},
            {"now", valueOf(chronicle.now)},
            {"complete", chronicle.isComplete},
            {"assumptions", Array(chronicle.assumptions.begin(), chronicle.assumptions.end())},
            {"devices", devices},
            {"activities", activities}};
}

}  // namespace vrx::timeline
