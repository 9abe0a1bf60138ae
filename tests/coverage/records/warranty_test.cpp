// The coverage record: how its fields are read, its derived values, equality, and the archive it crosses the IPC in.
#include "vrx/coverage/records/warranty.h"

#include <gtest/gtest.h>

#include <cmath>
#include <limits>

#include "vrx/codec/core/keyed_archive.h"
#include "vrx/sim/host.h"

namespace vrx {
namespace {

using platform::Array;
using platform::Data;
using platform::Date;
using platform::dateFromEpoch;
using platform::Dictionary;
using platform::Duration;
using platform::Value;

class WarrantyTest : public testing::Test {
protected:
    std::shared_ptr<VRXWarranty> record(Dictionary dictionary) {
        return VRXWarranty::warrantyWithDictionary(std::move(dictionary));
    }
    std::shared_ptr<VRXWarranty> eligibleFor(Duration time, Dictionary more = {}) {
        // Whole seconds: an epoch number's fraction is cut off.
        more["qxOfferEligibleUntil"] = platform::epochSeconds(host.clock.now() + time);
        more.try_emplace("qxLocalizedOfferSingularDesc", "last day");
        more.try_emplace("qxLocalizedOfferPluralDescFormat", "%@ days left");
        return record(std::move(more));
    }
    sim::Host host;
};

TEST_F(WarrantyTest, ReadsFieldsFromTheirPlaces) {
    auto warranty =
        record({{"covered", true},
                {"coverageEndDate", 1700000000},
                {"footer2LinkURL", "https://support.example/"},
                {"qxOfferBadgeBeforeEndDate", 1.5},
                {"isQxSubscription", "Yes"},
                {"unknown", 7},
                {"featureToggleParameters", Dictionary{{"qxOfferDisplay", 1},
                                                       {"qxOfferDurationDaysBeforeEndDate", "30 days"},
                                                       {"qxOfferToggle", Array{"31026"}}}},
                {"coverage", Dictionary{{"localizedCoverageTitle", "Details"},
                                        {"benefitsCard", Dictionary{{"localizedBenefitsCardFooter", "Foot"}}}}}});
    ASSERT_TRUE(warranty);
    EXPECT_TRUE(warranty->covered());
    EXPECT_EQ(warranty->coverageEndDate(), dateFromEpoch(1700000000));
    EXPECT_EQ(warranty->footer2LinkURL(), Value("https://support.example/"));
    EXPECT_EQ(warranty->qxOfferBadgeDurationBeforeEndDate(), Duration(129600));
    EXPECT_EQ(warranty->qxOfferBadgeDaysBeforeEndDate(), Value(1.5));
    EXPECT_TRUE(warranty->isCoveragePlanSubscriptionType());
    EXPECT_TRUE(warranty->qxOfferDisplay());
    EXPECT_EQ(warranty->qxOfferDurationBeforeEndDate(), Duration(2592000));
    EXPECT_EQ(warranty->qxOfferToggle(), Value(Array{"31026"}));
    EXPECT_EQ(warranty->localizedCoverageDetailsTitle(), Value("Details"));
    EXPECT_EQ(warranty->localizedBenefitsCardFooter(), Value("Foot"));
    EXPECT_EQ(warranty->dictionaryRepresentation()["unknown"], Value(7));
}

TEST_F(WarrantyTest, WrongTypesReadAsAbsent) {
    EXPECT_FALSE(VRXWarranty::warrantyWithDictionary(nullptr));
    EXPECT_FALSE(VRXWarranty::warrantyWithDictionary(Array{1}));
    auto warranty = record({{"covered", Array{}},
                            {"coverageEndDate", "1700000000"},
                            {"qxOfferBadgeBeforeEndDate", Dictionary{}},
                            {"featureToggleParameters", nullptr},
                            {"coverage", "text"}});
    ASSERT_TRUE(warranty);
    EXPECT_FALSE(warranty->covered());
    EXPECT_FALSE(warranty->coverageEndDate());
    EXPECT_EQ(warranty->qxOfferBadgeDurationBeforeEndDate(), Duration(0));
    EXPECT_FALSE(warranty->qxOfferDisplay());
    EXPECT_EQ(warranty->coverageDetailsDictionary(), Value("text"));
    EXPECT_TRUE(warranty->benefitDetailsArray().isNull());

    auto empty = record({});
    ASSERT_TRUE(empty);
    EXPECT_EQ(empty->daysEligible(), 0u);
    EXPECT_TRUE(empty->qxLocalizedOfferDesc().isNull());
}

TEST_F(WarrantyTest, ReadsFlagsAndDays) {
    const std::pair<Value, bool> flags[] = {{true, true},     {false, false},      {0, false},     {-0.5, true},
                                            {"yes", true},    {" \t-007", true},   {"000", false}, {"", false},
                                            {"   ", false},   {"+T", true},        {"no", false},  {"+-1", false},
                                            {nullptr, false}, {std::nan(""), true}};
    for (const auto& [value, expected] : flags)
        EXPECT_EQ(record({{"covered", value}})->covered(), expected) << value.description();
    const std::pair<Value, double> days[] = {{2, 172800},
                                             {"1.5days", 129600},
                                             {"x", 0},
                                             {true, 86400},
                                             {"-1", -86400.0},
                                             {1e308, 0},
                                             {std::numeric_limits<double>::infinity(), 0},
                                             {std::nan(""), 0},
                                             {nullptr, 0}};
    for (const auto& [value, expected] : days)
        EXPECT_EQ(record({{"qxOfferBadgeBeforeEndDate", value}})->qxOfferBadgeDurationBeforeEndDate(),
                  Duration(expected))
            << value.description();
}

TEST_F(WarrantyTest, ReadsEpochNumbers) {
    const std::pair<Value, std::optional<double>> epochs[] = {
        {1700000000, 1700000000},
        {1700000000123, 1700000000},
        {10000000000, 10000000000},
        {10000000001, 10000000},
        {1700000000.9, 1700000000},
        {0, 0},
        {-1, std::nullopt},
        {-0.5, std::nullopt},
        {"1700000000", std::nullopt},
        {true, std::nullopt},
        {nullptr, std::nullopt},
        {std::nan(""), std::nullopt},
        {std::numeric_limits<double>::infinity(), std::nullopt},
        {std::numeric_limits<std::int64_t>::max(), 9223372036854775.0},
        {1e308, 18446744073709551.0}};
    for (const auto& [value, expected] : epochs) {
        auto date = VRXWarranty::_dateWithEpochNumber(value);
        ASSERT_EQ(date.has_value(), expected.has_value()) << value.description();
        EXPECT_EQ(date.value_or(dateFromEpoch(0)), dateFromEpoch(expected.value_or(0))) << value.description();
    }
}

TEST_F(WarrantyTest, CountsDaysUpwards) {
    constexpr double day = 86400;
    const std::pair<double, std::uint32_t> cases[] = {{day, 1}, {day + 1, 2}, {1, 1}, {0, 0}, {-1, 0}, {-10 * day, 0}};
    for (auto [seconds, expected] : cases)
        EXPECT_EQ(eligibleFor(Duration(seconds))->daysEligible(), expected) << seconds;
    host.defaults.set("OneDayInterval", 10);
    EXPECT_EQ(eligibleFor(Duration(25))->daysEligible(), 3u);
    host.defaults.set("OneDayInterval", 0.000001);
    EXPECT_EQ(eligibleFor(Duration(10 * day))->daysEligible(), 4294967295u);
    host.defaults.set("OneDayInterval", -1);
    EXPECT_EQ(eligibleFor(Duration(25))->daysEligible(), 1u);
}

TEST_F(WarrantyTest, ChoosesTheTextByTheDays) {
    constexpr Duration day(86400);
    EXPECT_EQ(eligibleFor(day)->qxLocalizedOfferDesc(), Value("last day"));
    EXPECT_EQ(eligibleFor(1234 * day)->qxLocalizedOfferDesc(), Value("1,234 days left"));
    EXPECT_EQ(eligibleFor(2 * day, {{"qxLocalizedOfferPluralDescFormat", "%@ of %@, 100%"}})->qxLocalizedOfferDesc(),
              Value("2 of %@, 100%"));

    auto badFormat = eligibleFor(2 * day, {{"qxLocalizedOfferPluralDescFormat", 5}});
    EXPECT_TRUE(badFormat->qxLocalizedOfferDesc().isNull());
    EXPECT_TRUE(badFormat->qxLocalizedOfferDetailsEligibility().isNull());
    EXPECT_TRUE(host.log.contains("qxLocalizedOfferDesc: qxLocalizedOfferPluralDescFormat is not a string"));
    EXPECT_TRUE(host.log.contains(
        "qxLocalizedOfferDetailsEligibility: qxLocalizedOfferDetailsPluralEligibilityFormat is not a string"));
    host.clock.set(host.clock.now() + day);  // one day left: the singular needs no format
    EXPECT_EQ(badFormat->qxLocalizedOfferDesc(), Value("last day"));
}

TEST_F(WarrantyTest, IsEqualByItsDictionaryAndSurvivesTheArchive) {
    Dictionary dictionary{
        {"covered", true}, {"$class", "forged"}, {"list", Array{1, 2.5, dateFromEpoch(5), Dictionary{}}}};
    auto warranty = record(dictionary);
    EXPECT_TRUE(warranty->isEqual(record(dictionary).get()));
    EXPECT_FALSE(warranty->isEqual(record({{"covered", true}}).get()));
    EXPECT_FALSE(warranty->isEqual(nullptr));

    auto restored = codec::unarchive<VRXWarranty>(codec::archive(*warranty));
    ASSERT_TRUE(restored) << restored.error().text;
    EXPECT_TRUE(warranty->isEqual(restored->get()));

    // Nulls and data have no place in the archive; the rest of the record still arrives.
    auto holed = codec::unarchive<VRXWarranty>(
        codec::archive(*record({{"covered", true}, {"kelURL", nullptr}, {"list", Array{nullptr, 1, Data{1}}}})));
    ASSERT_TRUE(holed);
    EXPECT_EQ((*holed)->dictionaryRepresentation(), Value(Dictionary{{"covered", true}, {"list", Array{1}}}));
}

}  // namespace
}  // namespace vrx
