// The rules for the next post and the next refresh. All times are days from now.
#include "support/simulated_host.h"
#include "vrx/devices/records/device_info.h"
#include "vrx/platform/sha256_hash.h"
#include "vrx/scheduling/post_date.h"
#include "vrx/scheduling/refresh_date.h"

namespace vrx {
namespace {

constexpr Date now = sim::Clock::start;
constexpr double second = 1.0 / 86400;

Duration days(double count) {
    return Duration(count * 86400);
}

struct Device {
    std::optional<double> activated{}, shownFrom{}, until{};
    bool asksForOffer = true;
    std::string serialNumber = "A";
    bool isKnown = true;
};

DeviceInfoList infos(const std::vector<Device>& devices) {
    auto date = [](std::optional<double> day) { return day ? std::optional(now + days(*day)) : std::nullopt; };
    DeviceInfoList list;
    for (const Device& device : devices) {
        auto warranty = VRXWarranty::warrantyWithDictionary(Dictionary{});
        warranty->setQxOfferDisplay(device.asksForOffer);
        warranty->setQxOfferEligibleUntil(date(device.until));
        warranty->setQxOfferFollowupDisplayDate(date(device.shownFrom));
        auto known = VRXDevice::deviceWithName({}, device.serialNumber, date(device.activated), VRXDeviceTypeWatch);
        list.push_back(
            VRXDeviceInfo::deviceInfoWithDevice(device.isKnown ? std::move(known) : nullptr, std::move(warranty)));
    }
    list.push_back(VRXDeviceInfo::deviceInfoWithDevice(
        VRXDevice::deviceWithName({}, "no record", now, VRXDeviceTypeWatch), nullptr));
    return list;
}

struct Case {
    const char* name;
    std::vector<Device> devices{};
    std::optional<double> expected{};
    bool isInitial = true;  // else there is a refresh a day from now
    double oneDay = 1;
};

void expectDate(const Case& c, const std::optional<Date>& date) {
    ASSERT_EQ(date.has_value(), c.expected.has_value()) << c.name;
    if (!date) return;
    EXPECT_NEAR((*date - now) / days(1), *c.expected, 1e-9) << c.name;
}

// What most cases are made of.
const Device dueIn1{.activated = -1, .until = 300}, dueIn10{.activated = 0, .shownFrom = 10, .until = 300};
const Device shown{.activated = -3, .until = 10.5}, onItsLastDay{.activated = -3, .until = 0.25};
const Device ended{.activated = -9, .until = -3}, endedEarlier{.activated = -9, .until = -5};

TEST(PostDate, FollowsTheRule) {
    sim::Host host;
    const PostDateSettings settings{{platform::sha256Hash("POSTED")}, days(2)};
    const Device posted{.activated = -9, .until = -3, .serialNumber = "POSTED"}, endsIn5{.activated = -9, .until = 5};
    const Device withoutEnd{.activated = -1, .shownFrom = 3}, dueIn5{.activated = 3, .shownFrom = 2, .until = 300};
    const Device inAMoment{.activated = -9, .shownFrom = second / 2, .until = 300};
    const Device dueIn7{.activated = 0, .shownFrom = 7, .until = 300},
        dueIn20{.activated = 0, .shownFrom = 20, .until = 300};
    const Case cases[] = {
        {.name = "no device"},
        {.name = "the delay after the activation", .devices = {dueIn1}, .expected = 1},
        {.name = "the record's day is later", .devices = {dueIn10}, .expected = 10},
        {.name = "the record's day is earlier", .devices = {dueIn5}, .expected = 5},
        {.name = "both have passed", .devices = {{.activated = -9, .shownFrom = -3, .until = 300}}},
        {.name = "does not ask", .devices = {{.activated = -1, .until = 300, .asksForOffer = false}}},
        {.name = "ended", .devices = {ended}, .expected = -3},
        {.name = "the first ended one stops the scan", .devices = {ended, endedEarlier, dueIn1}, .expected = -3},
        {.name = "an ended one after a date", .devices = {dueIn1, endedEarlier}, .expected = -5},
        {.name = "posted before", .devices = {posted, dueIn1}, .expected = 1},
        {.name = "the earliest of three", .devices = {dueIn10, dueIn7, dueIn20}, .expected = 7},
        {.name = "an end before the date", .devices = {{.activated = 0, .shownFrom = 10, .until = 5}}, .expected = 5},
        {.name = "an end before another's date", .devices = {dueIn10, endsIn5}, .expected = 5},
        {.name = "without a date, an end to come is none", .devices = {endsIn5, dueIn10}, .expected = 10},
        {.name = "no activation, the record's day to come", .devices = {{.shownFrom = 4, .until = 300}}, .expected = 4},
        {.name = "no activation, the record's day passed", .devices = {{.shownFrom = -4, .until = 300}}},
        {.name = "no end", .devices = {withoutEnd}},
        {.name = "an unknown end counts as now", .devices = {dueIn10, withoutEnd}},
        {.name = "and what follows it sets the date", .devices = {dueIn10, withoutEnd, dueIn20}, .expected = 20},
        {.name = "in a moment", .devices = {inAMoment}, .expected = second / 2},
        {.name = "now is earlier than that", .devices = {inAMoment, withoutEnd}},
        {.name = "due now", .devices = {{.activated = -9, .shownFrom = 0, .until = 300}}},
        {.name = "ends now", .devices = {{.activated = -9, .until = 0}}},
        {.name = "a record of no device", .devices = {{.shownFrom = 4, .until = 9, .isKnown = false}}, .expected = 4},
    };
    for (const Case& c : cases) expectDate(c, nextPostDate(infos(c.devices), settings, now));
}

TEST(RefreshDate, FollowsTheRule) {
    sim::Host host;
    const Device notYet{.activated = 1, .until = 20}, notYetByRecord{.activated = -9, .shownFrom = 4, .until = 20};
    const Device changesIn75{.activated = -3, .until = 10.75}, changesIn25{.activated = -3, .until = 7.25};
    const Device withoutEnd{.activated = -3}, withoutActivation{.shownFrom = -4, .until = 10.5},
        shownSoon{.activated = -1.9, .until = 30};
    const Device shownIn3{.activated = 1, .until = 10.5}, changesInHalfAnHour{.activated = -3, .until = 10.5 / 24};
    const Case cases[] = {
        {.name = "no device"},
        {.name = "shown, the day count changes", .devices = {shown}, .expected = 0.5},
        {.name = "shown, a whole number of days", .devices = {{.activated = -3, .until = 10}}, .expected = 1},
        {.name = "not shown yet", .devices = {notYet}, .expected = 3},
        {.name = "not shown yet, by the record's day", .devices = {notYetByRecord}, .expected = 4},
        {.name = "does not ask", .devices = {{.activated = -3, .until = 10.5, .asksForOffer = false}}},
        {.name = "last day", .devices = {onItsLastDay}},
        {.name = "another's last day after a date", .devices = {shown, onItsLastDay}, .expected = 0.25},
        {.name = "another's last day before there is a date", .devices = {onItsLastDay, shown}, .expected = 0.5},
        {.name = "the earliest of three", .devices = {shown, changesIn25, changesIn75}, .expected = 0.25},
        {.name = "first shown before another's day count changes", .devices = {shownSoon, shown}, .expected = 0.1},
        {.name = "ended", .devices = {ended}, .expected = -3},
        {.name = "ended, after a date", .devices = {shown, ended, endedEarlier}, .expected = -3},
        {.name = "no end", .devices = {withoutEnd}},
        {.name = "no end takes no date away", .devices = {shown, withoutEnd}, .expected = 0.5},
        {.name = "no activation, the record's day to come", .devices = {{.shownFrom = 4, .until = 20}}, .expected = 4},
        {.name = "no activation, the record's day passed", .devices = {withoutActivation}},
        {.name = "no activation, after a date", .devices = {changesIn75, withoutActivation}, .expected = 0.5},
        {.name = "a later call, no device", .expected = 1, .isInitial = false},
        {.name = "a later call, shown", .devices = {shown}, .expected = 0.5, .isInitial = false},
        {.name = "a later call, the count changes first", .devices = {shownIn3}, .expected = 0.5, .isInitial = false},
        {.name = "a later call, ended", .devices = {ended}, .expected = -3, .isInitial = false},
        {.name = "days of an hour", .devices = {changesInHalfAnHour}, .expected = 0.5 / 24, .oneDay = 1.0 / 24},
        {.name = "days of no length", .devices = {shown}, .oneDay = 0},
        {.name = "days of half a second",
         .devices = {{.activated = -3, .until = 0.9 * second}},
         .expected = 0.4 * second,
         .oneDay = second / 2},
    };
    for (const Case& c : cases)
        expectDate(c, nextRefreshDate(infos(c.devices), c.isInitial, {days(c.oneDay), days(2)}, now));
}

}  // namespace
}  // namespace vrx
