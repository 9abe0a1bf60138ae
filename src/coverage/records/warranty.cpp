#include "vrx/coverage/records/warranty.h"

#include <algorithm>
#include <array>
#include <cmath>
#include <concepts>
#include <limits>
#include <variant>

#include "vrx/coverage/records/coverage_keys.h"
#include "vrx/platform/clock.h"
#include "vrx/platform/defaults_store.h"
#include "vrx/platform/keyed_archiver.h"
#include "vrx/platform/locale.h"
#include "vrx/platform/log.h"
#include "vrx/platform/number_text.h"
#include "vrx/platform/platform.h"
#include "vrx/platform/settings_keys.h"
#include "vrx/platform/text.h"

namespace vrx {

using platform::Date;
using platform::Duration;
using platform::Level;
using platform::Platform;
using platform::Value;

namespace {

constexpr double secondsOfDay = 86400.0;
constexpr std::string_view dictionaryRepresentationKey = "DictionaryRepresentation";

// A value, read as a number of days; 0 when the result is not finite.
Duration daysFrom(const Value& value) {
    double seconds = platform::numberFromValue(value) * secondsOfDay;
    return Duration(std::isfinite(seconds) ? seconds : 0);
}

// The objects of the coverage dictionary that hold fields.
enum class Object { Root, FeatureToggleParameters, Coverage, BenefitsCard };

struct Objects {
    explicit Objects(const Value& root)
        : root(root),
          featureToggleParameters(root["featureToggleParameters"]),
          coverage(root["coverage"]),
          benefitsCard(coverage["benefitsCard"]) {}

    const Value& operator[](Object object) const {
        switch (object) {
            case Object::Root: return root;
            case Object::FeatureToggleParameters: return featureToggleParameters;
            case Object::Coverage: return coverage;
            case Object::BenefitsCard: return benefitsCard;
        }
        return root;
    }

    const Value& root;
    const Value& featureToggleParameters;
    const Value& coverage;
    const Value& benefitsCard;
};

// One row of the mapping from the dictionary to the fields. The type of the field decides how its value is read.
using Fields = VRXWarranty::Fields;

struct Row {
    Object object;
    std::string_view key;
    std::variant<bool Fields::*, std::optional<Date> Fields::*, Duration Fields::*, Value Fields::*> field;
};

constexpr Row flag(Object object, std::string_view key, bool Fields::*field) {
    return {object, key, field};
}
constexpr Row epoch(Object object, std::string_view key, std::optional<Date> Fields::*field) {
    return {object, key, field};
}
constexpr Row days(Object object, std::string_view key, Duration Fields::*field) {
    return {object, key, field};
}
constexpr Row asSent(Object object, std::string_view key, Value Fields::*field) {
    return {object, key, field};
}

// The keys are the server's and are spelled so on purpose: "Qx" beside "qx", and one key that fills two fields.
// clang-format off
constexpr auto rows = std::to_array<Row>({
    flag(Object::Root, "covered", &Fields::covered),
    epoch(Object::Root, "coverageEndDate", &Fields::coverageEndDate),
    asSent(Object::Root, "localizedCoveredDeviceDateLabelFormat", &Fields::localizedCoveredDeviceDateLabelFormat),
    asSent(Object::Root, "coverageLocalizedLabel", &Fields::coverageLocalizedLabel),
    asSent(Object::Root, "coverageLocalizedDesc", &Fields::coverageLocalizedDesc),
    asSent(Object::Root, "coverageLocalizedDescLong", &Fields::coverageLocalizedDescLong),
    asSent(Object::Root, "coverageLocalizedExpirationLabel", &Fields::coverageLocalizedExpirationLabel),
    asSent(Object::Root, "footer1FormatString", &Fields::footer1FormatString),
    asSent(Object::Root, "footer1LinkLabel", &Fields::footer1LinkLabel),
    asSent(Object::Root, "footer1LinkURL", &Fields::footer1LinkURL),
    asSent(Object::Root, "footer2FormatString", &Fields::footer2FormatString),
    asSent(Object::Root, "footer2LinkLabel", &Fields::footer2LinkLabel),
    asSent(Object::Root, "footer2LinkURL", &Fields::footer2LinkURL),
    flag(Object::Root, "qxOfferEligible", &Fields::qxOfferEligible),
    epoch(Object::Root, "qxOfferEligibleUntil", &Fields::qxOfferEligibleUntil),
    epoch(Object::Root, "qxOfferFollowupDisplayDate", &Fields::qxOfferFollowupDisplayDate),
    epoch(Object::Root, "qxOfferDisplayDate", &Fields::qxOfferDisplayDate),
    asSent(Object::Root, "qxOfferIdentifier", &Fields::qxOfferIdentifier),
    asSent(Object::Root, "qxLocalizedOfferLabel", &Fields::qxLocalizedOfferLabel),
    asSent(Object::Root, "qxLocalizedOfferPluralDescFormat", &Fields::qxLocalizedOfferPluralDescFormat),
    asSent(Object::Root, "qxLocalizedOfferSingularDesc", &Fields::qxLocalizedOfferSingularDesc),
    asSent(Object::Root, "qxLocalizedOfferCTA", &Fields::qxLocalizedOfferCTA),
    asSent(Object::Root, "qxLocalizedOfferDetails", &Fields::qxLocalizedOfferDetails),
    asSent(Object::Root, "qxLocalizedOfferDetailsPluralEligibilityFormat", &Fields::qxLocalizedOfferDetailsPluralEligibilityFormat),
    asSent(Object::Root, "qxLocalizedOfferDetailsSingularEligibility", &Fields::qxLocalizedOfferDetailsSingularEligibility),
    flag(Object::FeatureToggleParameters, "qxOfferDisplay", &Fields::qxOfferDisplay),
    flag(Object::FeatureToggleParameters, "qxOfferSettingsAppBadge", &Fields::qxOfferSettingsAppBadge),
    flag(Object::FeatureToggleParameters, "qxOfferSettingsRowBadge", &Fields::qxOfferSettingsRowBadge),
    days(Object::FeatureToggleParameters, "qxOfferDurationDaysBeforeEndDate", &Fields::qxOfferDurationBeforeEndDate),
    asSent(Object::FeatureToggleParameters, "qxOfferToggle", &Fields::qxOfferToggle),
    days(Object::Root, "qxOfferBadgeBeforeEndDate", &Fields::qxOfferBadgeDurationBeforeEndDate),
    flag(Object::Root, "qxLogoToggle", &Fields::coverageHasQXLogo),
    asSent(Object::Root, "qxServicesPartner", &Fields::localizedCoverageSubTitleForServicesPartnerString),
    asSent(Object::Coverage, "localizedCoverageFooterFormatString", &Fields::localizedCoverageFooterFormatString),
    asSent(Object::Coverage, "localizedCoverageFooterLinkLabel", &Fields::localizedCoverageFooterLinkLabel),
    asSent(Object::Root, "localizedSupportAppLabel", &Fields::localizedSupportAppLabel),
    flag(Object::Root, "isQxSubscription", &Fields::isCoveragePlanSubscriptionType),
    asSent(Object::Root, "localizedManagePlanLabel", &Fields::localizedManagePlanLabel),
    asSent(Object::Root, "qxOfferBadgeBeforeEndDate", &Fields::qxOfferBadgeDaysBeforeEndDate),
    flag(Object::Root, "isQxServicesPartner", &Fields::isQXServicesPartner),
    asSent(Object::Root, "coverage", &Fields::coverageDetailsDictionary),
    asSent(Object::Coverage, "localizedCoverageTitle", &Fields::localizedCoverageDetailsTitle),
    asSent(Object::Coverage, "coverageDetails", &Fields::coverageDetailsArray),
    asSent(Object::Coverage, "benefitsCard", &Fields::coverageBenefitsDictionary),
    asSent(Object::BenefitsCard, "localizedBenefitsCardTitle", &Fields::localizedBenefitsCardTitle),
    asSent(Object::BenefitsCard, "localizedBenefitsCardSubTitle", &Fields::localizedBenefitsCardSubTitle),
    asSent(Object::BenefitsCard, "benefitDetails", &Fields::benefitDetailsArray),
    asSent(Object::BenefitsCard, "localizedBenefitsCardFooter", &Fields::localizedBenefitsCardFooter),
    flag(Object::Root, "displayRepairAndSupport", &Fields::displayRepairAndSupport),
    asSent(Object::Root, "kelURL", &Fields::kelURL),
    asSent(Object::Root, "supportAppURL", &Fields::supportAppURL),
});
// clang-format on

// No member is filled twice, and no key twice by the same rule.
constexpr bool areRowsDistinct() {
    for (std::size_t i = 0; i < rows.size(); ++i)
        for (std::size_t j = 0; j < i; ++j) {
            if (rows[i].field == rows[j].field) return false;
            if (rows[i].field.index() == rows[j].field.index() && rows[i].object == rows[j].object &&
                rows[i].key == rows[j].key)
                return false;
        }
    return true;
}
static_assert(areRowsDistinct(), "two rows fill one member, or read one key by one rule");

// Stands for a field of any type. As many of them as there are fields make a Fields, and no more.
struct AnyField {
    template <class T>
    requires(std::same_as<T, bool> || std::same_as<T, std::optional<Date>> || std::same_as<T, Duration> ||
             std::same_as<T, Value>)
    operator T() const;
};
template <class... Given>
constexpr std::size_t numberOfFields() {
    if constexpr (requires { Fields{Given()..., AnyField()}; })
        return numberOfFields<Given..., AnyField>();
    else
        return sizeof...(Given);
}
// coverageValidityDate, localizedCoverageDetailsLabel, localizedCoverageDetailsValue, localizedBenefitLabelKey,
// localizedBenefitValueKey and serialNumber are never filled; dictionaryRepresentation is the whole.
constexpr std::size_t fieldsWithoutRow = 7;
static_assert(rows.size() + fieldsWithoutRow == numberOfFields(), "a field has no row, or a row too many");

void read(const Value& value, bool& field) {
    field = platform::flagFromValue(value);
}
void read(const Value& value, std::optional<Date>& field) {
    field = VRXWarranty::_dateWithEpochNumber(value);
}
void read(const Value& value, Duration& field) {
    field = daysFrom(value);
}
void read(const Value& value, Value& field) {
    field = value;
}

}  // namespace

std::vector<CoverageKey> coverageKeys() {
    static constexpr std::string_view objects[] = {"", "featureToggleParameters", "coverage", "coverage.benefitsCard"};
    using Kind = CoverageKey::Kind;
    static constexpr Kind kinds[] = {Kind::Flag, Kind::Date, Kind::Days, Kind::AsSent};  // in the order of Row::field
    std::vector<CoverageKey> keys;
    keys.reserve(rows.size());
    for (const Row& row : rows)
        keys.push_back({objects[static_cast<std::size_t>(row.object)], row.key, kinds[row.field.index()]});
    return keys;
}

std::shared_ptr<VRXWarranty> VRXWarranty::warrantyWithDictionary(const Value& dictionary) {
    return warrantyWithDictionary(dictionary, std::nullopt);
}

std::shared_ptr<VRXWarranty> VRXWarranty::warrantyWithDictionary(const Value& dictionary,
                                                                 const std::optional<std::string>& serialNumber) {
    auto warranty = initWithDictionary(dictionary, serialNumber);
    log(Level::Default, "%s : %d", "+[VRXWarranty warrantyWithDictionary:serialNumber:]", warranty != nullptr);
    return warranty;
}

std::shared_ptr<VRXWarranty> VRXWarranty::initWithDictionary(const Value& dictionary) {
    return initWithDictionary(dictionary, std::nullopt);
}

std::shared_ptr<VRXWarranty> VRXWarranty::initWithDictionary(const Value& dictionary,
                                                             const std::optional<std::string>& /*serialNumber*/) {
    if (!dictionary.asDictionary()) return nullptr;
    Fields fields;
    fields.dictionaryRepresentation = dictionary;
    Objects objects(fields.dictionaryRepresentation);
    for (const Row& row : rows) {
        const Value& value = objects[row.object][row.key];
        std::visit([&](auto field) { read(value, fields.*field); }, row.field);
    }
    return std::shared_ptr<VRXWarranty>(new VRXWarranty(std::move(fields)));
}

std::optional<Date> VRXWarranty::_dateWithEpochNumber(const Value& number) {
    constexpr std::uint64_t largestSeconds = 10'000'000'000;  // above it, milliseconds
    constexpr double twoTo64 = 18446744073709551616.0;
    std::optional<double> real = number.asNumber();
    if (!real || !std::isfinite(*real) || *real <= -1) return std::nullopt;
    std::uint64_t whole =
        *real < twoTo64 ? static_cast<std::uint64_t>(*real) : std::numeric_limits<std::uint64_t>::max();
    if (auto integer = number.asInteger()) whole = static_cast<std::uint64_t>(*integer);  // exact beyond 2^53 too
    return platform::dateFromEpoch(static_cast<double>(whole > largestSeconds ? whole / 1000 : whole));
}

std::uint32_t VRXWarranty::daysEligible() const {
    Duration day(Platform::current().defaultsStore().number(platform::settings::oneDayInterval));
    return daysEligible(qxOfferEligibleUntil(), day, Platform::current().clock().now());
}

std::uint32_t VRXWarranty::daysEligible(const std::optional<Date>& until, Duration day, Date now) {
    if (!(day > Duration(0))) day = Duration(secondsOfDay);
    double wholeDays = std::ceil(until ? (*until - now) / day : 0);
    constexpr double most = std::numeric_limits<std::uint32_t>::max();
    return wholeDays > 0 ? static_cast<std::uint32_t>(std::min(wholeDays, most)) : 0;
}

Value VRXWarranty::qxLocalizedOfferDesc() const {
    return textForDaysEligible(qxLocalizedOfferSingularDesc(), qxLocalizedOfferPluralDescFormat(), [] {
        log(Level::Error, "qxLocalizedOfferDesc: qxLocalizedOfferPluralDescFormat is not a string");
    });
}

Value VRXWarranty::qxLocalizedOfferDetailsEligibility() const {
    return textForDaysEligible(
        qxLocalizedOfferDetailsSingularEligibility(), qxLocalizedOfferDetailsPluralEligibilityFormat(), [] {
            log(Level::Error,
                "qxLocalizedOfferDetailsEligibility: qxLocalizedOfferDetailsPluralEligibilityFormat is not a string");
        });
}

Value VRXWarranty::textForDaysEligible(const Value& singular, const Value& pluralFormat, void (*reportFormat)()) const {
    std::uint32_t count = daysEligible();
    if (count <= 1) return singular;
    const std::string* format = pluralFormat.asString();
    if (!format) {
        reportFormat();
        return nullptr;
    }
    // Only the first placeholder is filled. The rest of the format, a further placeholder included, is shown as it is.
    return platform::filled(*format, {Platform::current().locale().decimalText(count)});
}

bool VRXWarranty::isEqual(const platform::Archivable* other) const {
    const auto* warranty = dynamic_cast<const VRXWarranty*>(other);
    return warranty && warranty->dictionaryRepresentation() == dictionaryRepresentation();
}

void VRXWarranty::encodeWithCoder(platform::KeyedEncoder& coder) const {
    coder.encodeObject(dictionaryRepresentationKey, dictionaryRepresentation());
}

std::shared_ptr<VRXWarranty> VRXWarranty::initWithCoder(platform::KeyedDecoder& coder) {
    using enum platform::AllowedKinds::Kind;
    return initWithDictionary(
        coder.decodeValue(dictionaryRepresentationKey, {Dictionaries, Arrays, Strings, Numbers, Dates}));
}

}  // namespace vrx
