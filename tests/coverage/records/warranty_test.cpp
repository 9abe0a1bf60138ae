// The coverage record: how its fields are read, its derived values, equality, and the archive it crosses the IPC in.
#include "vrx/coverage/records/warranty.h"

#include <cmath>
#include <limits>
#include <set>

#include "support/simulated_host.h"
#include "vrx/codec/core/keyed_archive.h"
#include "vrx/coverage/records/coverage_keys.h"

namespace vrx {
namespace {

class WarrantyTest : public OnSimulatedHost {
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
};

// Where the fields of one rule stand in the dictionary.
template <class T>
using Places = std::vector<std::pair<std::string_view, T (VRXWarranty::*)() const>>;

const Places<bool> flags{
    {"covered", &VRXWarranty::covered},
    {"qxOfferEligible", &VRXWarranty::qxOfferEligible},
    {"featureToggleParameters.qxOfferDisplay", &VRXWarranty::qxOfferDisplay},
    {"featureToggleParameters.qxOfferSettingsAppBadge", &VRXWarranty::qxOfferSettingsAppBadge},
    {"featureToggleParameters.qxOfferSettingsRowBadge", &VRXWarranty::qxOfferSettingsRowBadge},
    {"qxLogoToggle", &VRXWarranty::coverageHasQXLogo},
    {"isQxSubscription", &VRXWarranty::isCoveragePlanSubscriptionType},
    {"isQxServicesPartner", &VRXWarranty::isQXServicesPartner},
    {"displayRepairAndSupport", &VRXWarranty::displayRepairAndSupport},
};
const Places<std::optional<Date>> epochs{
    {"coverageEndDate", &VRXWarranty::coverageEndDate},
    {"qxOfferEligibleUntil", &VRXWarranty::qxOfferEligibleUntil},
    {"qxOfferFollowupDisplayDate", &VRXWarranty::qxOfferFollowupDisplayDate},
    {"qxOfferDisplayDate", &VRXWarranty::qxOfferDisplayDate},
};
const Places<Duration> days{
    {"featureToggleParameters.qxOfferDurationDaysBeforeEndDate", &VRXWarranty::qxOfferDurationBeforeEndDate},
    {"qxOfferBadgeBeforeEndDate", &VRXWarranty::qxOfferBadgeDurationBeforeEndDate},
};
const Places<Value> asSent{
    {"localizedCoveredDeviceDateLabelFormat", &VRXWarranty::localizedCoveredDeviceDateLabelFormat},
    {"coverageLocalizedLabel", &VRXWarranty::coverageLocalizedLabel},
    {"coverageLocalizedDesc", &VRXWarranty::coverageLocalizedDesc},
    {"coverageLocalizedDescLong", &VRXWarranty::coverageLocalizedDescLong},
    {"coverageLocalizedExpirationLabel", &VRXWarranty::coverageLocalizedExpirationLabel},
    {"footer1FormatString", &VRXWarranty::footer1FormatString},
    {"footer1LinkLabel", &VRXWarranty::footer1LinkLabel},
    {"footer1LinkURL", &VRXWarranty::footer1LinkURL},
    {"footer2FormatString", &VRXWarranty::footer2FormatString},
    {"footer2LinkLabel", &VRXWarranty::footer2LinkLabel},
    {"footer2LinkURL", &VRXWarranty::footer2LinkURL},
    {"qxOfferIdentifier", &VRXWarranty::qxOfferIdentifier},
    {"qxLocalizedOfferLabel", &VRXWarranty::qxLocalizedOfferLabel},
    {"qxLocalizedOfferPluralDescFormat", &VRXWarranty::qxLocalizedOfferPluralDescFormat},
    {"qxLocalizedOfferSingularDesc", &VRXWarranty::qxLocalizedOfferSingularDesc},
    {"qxLocalizedOfferCTA", &VRXWarranty::qxLocalizedOfferCTA},
    {"qxLocalizedOfferDetails", &VRXWarranty::qxLocalizedOfferDetails},
    {"qxLocalizedOfferDetailsPluralEligibilityFormat", &VRXWarranty::qxLocalizedOfferDetailsPluralEligibilityFormat},
    {"qxLocalizedOfferDetailsSingularEligibility", &VRXWarranty::qxLocalizedOfferDetailsSingularEligibility},
    {"featureToggleParameters.qxOfferToggle", &VRXWarranty::qxOfferToggle},
    {"qxOfferBadgeBeforeEndDate", &VRXWarranty::qxOfferBadgeDaysBeforeEndDate},
    {"qxServicesPartner", &VRXWarranty::localizedCoverageSubTitleForServicesPartnerString},
    {"localizedSupportAppLabel", &VRXWarranty::localizedSupportAppLabel},
    {"localizedManagePlanLabel", &VRXWarranty::localizedManagePlanLabel},
    {"kelURL", &VRXWarranty::kelURL},
    {"supportAppURL", &VRXWarranty::supportAppURL},
    {"coverage", &VRXWarranty::coverageDetailsDictionary},
    {"coverage.localizedCoverageTitle", &VRXWarranty::localizedCoverageDetailsTitle},
    {"coverage.coverageDetails", &VRXWarranty::coverageDetailsArray},
    {"coverage.localizedCoverageFooterFormatString", &VRXWarranty::localizedCoverageFooterFormatString},
    {"coverage.localizedCoverageFooterLinkLabel", &VRXWarranty::localizedCoverageFooterLinkLabel},
    {"coverage.benefitsCard", &VRXWarranty::coverageBenefitsDictionary},
    {"coverage.benefitsCard.localizedBenefitsCardTitle", &VRXWarranty::localizedBenefitsCardTitle},
    {"coverage.benefitsCard.localizedBenefitsCardSubTitle", &VRXWarranty::localizedBenefitsCardSubTitle},
    {"coverage.benefitsCard.benefitDetails", &VRXWarranty::benefitDetailsArray},
    {"coverage.benefitsCard.localizedBenefitsCardFooter", &VRXWarranty::localizedBenefitsCardFooter},
};
const Places<Value> neverFilled{
    {"localizedCoverageDetailsLabel", &VRXWarranty::localizedCoverageDetailsLabel},
    {"localizedCoverageDetailsValue", &VRXWarranty::localizedCoverageDetailsValue},
    {"localizedBenefitLabelKey", &VRXWarranty::localizedBenefitLabelKey},
    {"localizedBenefitValueKey", &VRXWarranty::localizedBenefitValueKey},
    {"serialNumber", &VRXWarranty::serialNumber},
};

// A dictionary that holds nothing but a value at a path of keys.
Dictionary holding(std::string_view path, const Value& value) {
    const std::size_t dot = path.rfind('.');
    const Dictionary object{{std::string(path.substr(dot + 1)), value}};
    return dot == path.npos ? object : holding(path.substr(0, dot), object);
}

template <class T>
T fieldOf(const Dictionary& dictionary, T (VRXWarranty::*field)() const) {
    return (*VRXWarranty::initWithDictionary(dictionary).*field)();
}

// Every field of a rule reads each of the values alike.
template <class T>
void expectReading(const Places<T>& places, const std::type_identity_t<T>& expected, const std::vector<Value>& values) {
    for (const auto& [path, field] : places)
        for (const Value& value : values)
            EXPECT_EQ(fieldOf(holding(path, value), field), expected) << path << ": " << value.description();
}

// A field that is absent has its default, and so has one whose object is none.
template <class T>
void expectDefault(const Places<T>& places) {
    for (const auto& [path, field] : places) {
        EXPECT_EQ(fieldOf({{"unknown", 7}}, field), T()) << path;
        for (std::size_t dot = path.find('.'); dot != path.npos; dot = path.find('.', dot + 1))
            for (const Value& object : {Value("text"), Value(Array{1}), Value()})
                EXPECT_EQ(fieldOf(holding(path.substr(0, dot), object), field), T()) << path << object.description();
    }
}

const double infinity = std::numeric_limits<double>::infinity();

TEST_F(WarrantyTest, ReadsFlagsFromTheirPlaces) {
    expectReading(flags, true, {true, -0.5, "yes", " \t-007", "+T", std::nan("")});
    expectReading(flags, false, {false, 0, "000", "", "   ", "no", "+-1", nullptr, Array{}});
    expectDefault(flags);
}

TEST_F(WarrantyTest, ReadsDatesFromTheirPlaces) {
    expectReading(epochs, dateFromEpoch(0), {0, -0.5});
    expectReading(epochs, dateFromEpoch(1700000000), {1700000000, 1700000000.9, 1700000000123});
    expectReading(epochs, dateFromEpoch(10000000000), {10000000000});
    expectReading(epochs, dateFromEpoch(10000000), {10000000001});
    expectReading(epochs, dateFromEpoch(9223372036854775.0), {std::numeric_limits<std::int64_t>::max()});
    expectReading(epochs, dateFromEpoch(9007199254740.0), {9007199254740999});  // which no double can hold
    expectReading(epochs, dateFromEpoch(18446744073709551.0), {18446744073709551616.0, 1e308});
    expectReading(epochs, {}, {-1, -1.5, "1700000000", true, nullptr, std::nan(""), infinity, Dictionary{}});
    expectDefault(epochs);
}

TEST_F(WarrantyTest, ReadsNumbersOfDaysFromTheirPlaces) {
    constexpr Duration day(86400);
    expectReading(days, day, {1, true});
    expectReading(days, 1.5 * day, {1.5, "1.5days"});
    expectReading(days, -day, {"-1"});
    expectReading(days, {}, {"x", 1e308, infinity, std::nan(""), nullptr, Dictionary{}});
    expectDefault(days);
}

TEST_F(WarrantyTest, KeepsTheRestAsItWasSent) {
    for (const Value& value : {Value("text"), Value(1.5), Value(false), Value(Array{1}), Value(Dictionary{{"k", 1}})})
        expectReading(asSent, value, {value});
    expectDefault(asSent);
    expectReading(neverFilled, {}, {"text"});
    EXPECT_FALSE(record({{"coverageValidityDate", 1}})->coverageValidityDate());
    EXPECT_EQ(record({{"unknown", 7}})->dictionaryRepresentation(), Value(Dictionary{{"unknown", 7}}));
}

// What is told to programs that judge a server's answers.
TEST_F(WarrantyTest, ListsThePlacesFromWhichItReads) {
    std::multiset<std::pair<std::string, CoverageKey::Kind>> listed, read;
    for (const auto& [object, key, kind] : coverageKeys())
        listed.emplace(std::string(object) + (object.empty() ? "" : ".") + std::string(key), kind);
    for (const auto& [path, field] : flags) read.emplace(path, CoverageKey::Kind::Flag);
    for (const auto& [path, field] : epochs) read.emplace(path, CoverageKey::Kind::Date);
    for (const auto& [path, field] : days) read.emplace(path, CoverageKey::Kind::Days);
    for (const auto& [path, field] : asSent) read.emplace(path, CoverageKey::Kind::AsSent);
    EXPECT_EQ(listed, read);
}

TEST_F(WarrantyTest, IsOfADictionaryHoweverEmpty) {
    EXPECT_FALSE(VRXWarranty::warrantyWithDictionary(nullptr));
    EXPECT_FALSE(VRXWarranty::warrantyWithDictionary(Array{1}));
    ASSERT_TRUE(record({}));
    EXPECT_EQ(record({})->daysEligible(), 0u);
    EXPECT_TRUE(record({})->qxLocalizedOfferDesc().isNull());
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

    auto restored = [](const VRXWarranty& from) {
        return valueOf(codec::unarchive<VRXWarranty>(codec::archive(from)));
    };
    EXPECT_TRUE(warranty->isEqual(restored(*warranty).get()));
    // Nulls and data have no place in the archive; the rest of the record still arrives.
    auto holed = record({{"covered", true}, {"kelURL", nullptr}, {"list", Array{nullptr, 1, Data{1}}}});
    EXPECT_EQ(restored(*holed)->dictionaryRepresentation(), Value(Dictionary{{"covered", true}, {"list", Array{1}}}));
}

}  // namespace
}  // namespace vrx
