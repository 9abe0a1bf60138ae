// The rules for the next post and the next refresh. All times are days from now.
#include <gtest/gtest.h>

#include "vrx/devices/records/device_info.h"
#include "vrx/platform/sha256_hash.h"
#include "vrx/scheduling/post_date.h"
#include "vrx/scheduling/refresh_date.h"
#include "vrx/sim/host.h"

namespace vrx {
namespace {

using platform::Date;
using platform::Duration;

constexpr Date now = sim::Clock::start;
constexpr std::optional<double> absent;

Duration days(double count) {
    return Duration(count * 86400);
}

struct Device {
    std::optional<double> activated;
    std::optional<double> shownFrom;
    std::optional<double> until;
    bool asksForOffer = true;
    std::string serialNumber = "A";
};

DeviceInfoList infos(const std::vector<Device>& devices) {
    auto date = [](std::optional<double> day) { return day ? std::optional(now + days(*day)) : std::nullopt; };
    DeviceInfoList list;
    for (const Device& device : devices) {
        auto warranty = VRXWarranty::warrantyWithDictionary(platform::Dictionary{});
        warranty->setQxOfferDisplay(device.asksForOffer);
        warranty->setQxOfferEligibleUntil(date(device.until));
        warranty->setQxOfferFollowupDisplayDate(date(device.shownFrom));
        list.push_back(VRXDeviceInfo::deviceInfoWithDevice(
            VRXDevice::deviceWithName({}, device.serialNumber, date(device.activated), VRXDeviceTypeWatch),
            std::move(warranty)));
    }
    list.push_back(VRXDeviceInfo::deviceInfoWithDevice(
        VRXDevice::deviceWithName({}, "no record", now, VRXDeviceTypeWatch), nullptr));
    return list;
}

struct Case {
    const char* name;
    std::vector<Device> devices;
    std::optional<double> expected;
};

void expectDate(const Case& c, const std::optional<Date>& date) {
    ASSERT_EQ(date.has_value(), c.expected.has_value()) << c.name;
    if (!date) return;
    EXPECT_NEAR((*date - now) / days(1), *c.expected, 1e-9) << c.name;
}

TEST(PostDate, FollowsTheRule) {
    sim::Host host;
    const PostDateSettings settings{{platform::sha256Hash("POSTED")}, days(2)};
    const Case cases[] = {
        {"no device", {}, {}},
        {"the delay after the activation", {{-1, {}, 300}}, 1},
        {"the record's day is later", {{0, 10, 300}}, 10},
        {"the record's day is earlier", {{3, 2, 300}}, 5},
        {"both have passed", {{-9, -3, 300}}, absent},
        {"does not ask", {{-1, {}, 300, false}}, absent},
        {"ended", {{-9, {}, -3}}, -3},
        {"the first ended one stops the scan", {{-9, {}, -3}, {-9, {}, -5}, {-1, {}, 300}}, -3},
        {"an ended one after a date", {{-1, {}, 300}, {-9, {}, -5}}, -5},
        {"posted before", {{-9, {}, -3, true, "POSTED"}, {-1, {}, 300}}, 1},
        {"the earlier of two", {{0, 10, 300}, {0, 7, 300}, {0, 8, 300}}, 7},
        {"an end before the date", {{0, 10, 5}}, 5},
        {"an end before another's date", {{0, 10, 300}, {-9, {}, 5}}, 5},
        {"without a date, an end to come is none", {{-9, {}, 5}, {0, 10, 300}}, 10},
        {"no activation, the record's day to come", {{{}, 4, 300}}, 4},
        {"no activation, the record's day passed", {{{}, -4, 300}}, absent},
        {"no end", {{-1, 3, {}}}, absent},
        {"an unknown end counts as now", {{0, 10, 300}, {-1, 3, {}}}, absent},
        {"and what follows it sets the date", {{0, 10, 300}, {-1, 3, {}}, {0, 20, 300}}, 20},
    };
    for (const Case& c : cases) expectDate(c, nextPostDate(infos(c.devices), settings, now));
}

TEST(RefreshDate, FollowsTheRule) {
    sim::Host host;
    const Case cases[] = {
        {"no device", {}, absent},
        {"shown, the day count changes", {{-3, {}, 10.5}}, 0.5},
        {"shown, a whole number of days", {{-3, {}, 10}}, 1},
        {"not shown yet", {{1, {}, 20}}, 3},
        {"not shown yet, by the record's day", {{-9, 4, 20}}, 4},
        {"does not ask", {{-3, {}, 10.5, false}}, absent},
        {"last day", {{-3, {}, 0.25}}, absent},
        {"another's last day after a date", {{-3, {}, 10.5}, {-3, {}, 0.25}}, 0.25},
        {"another's last day before there is a date", {{-3, {}, 0.25}, {-3, {}, 10.5}}, 0.5},
        {"the earlier of two", {{-3, {}, 10.5}, {-3, {}, 7.25}, {-3, {}, 5.75}}, 0.25},
        {"first shown before another's day count changes", {{-1.9, {}, 30}, {-3, {}, 10.5}}, 0.1},
        {"ended", {{-9, {}, -3}}, -3},
        {"ended, after a date", {{-3, {}, 10.5}, {-9, {}, -3}, {-9, {}, -5}}, -3},
        {"no end", {{-3, {}, {}}}, absent},
        {"no end takes no date away", {{-3, {}, 10.5}, {-3, {}, {}}}, 0.5},
        {"no activation, the record's day to come", {{{}, 4, 20}}, 4},
        {"no activation, the record's day passed", {{{}, -4, 10.5}}, absent},
        {"no activation, after a date", {{-3, {}, 10.75}, {{}, -4, 10.5}}, 0.5},
    };
    for (const Case& c : cases) expectDate(c, nextRefreshDate(infos(c.devices), true, {days(1), days(2)}, now));
}

TEST(RefreshDate, BeginsADayFromNowUnlessTheCallIsInitial) {
    sim::Host host;
    const Case cases[] = {
        {"no device", {}, 1},
        {"shown", {{-3, {}, 10.5}}, 0.5},
        {"not shown yet, the count changes first", {{1, {}, 10.5}}, 0.5},
        {"ended", {{-9, {}, -3}}, -3},
    };
    for (const Case& c : cases) expectDate(c, nextRefreshDate(infos(c.devices), false, {days(1), days(2)}, now));

    // In days of their set length.
    expectDate({"hours", {}, 0.5 / 24}, nextRefreshDate(infos({{-3, {}, 10.5 / 24}}), true, {days(1.0 / 24), {}}, now));
    expectDate({"no length", {}, absent}, nextRefreshDate(infos({{-3, {}, 10.5}}), true, {Duration(0), {}}, now));
}

}  // namespace
}  // namespace vrx
