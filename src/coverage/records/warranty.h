// A device's coverage record: the server's answer for one serial number, and the typed fields read from it once, at
// construction. Shared by reference, and the agent does not change it after construction. Derived texts and day counts
// are computed on each read, from the clock. Any thread may read or replace a field.
// A leading "_" is spelled so on purpose; "Names" in docs/architecture.md says why.
#pragma once

#include <cstdint>
#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <utility>

#include "vrx/platform/api.h"
#include "vrx/platform/archivable.h"
#include "vrx/platform/date.h"
#include "vrx/platform/value.h"

namespace vrx {

class VRX_CLIENT_API VRXWarranty final : public platform::Archivable {
    using Date = platform::Date;
    using Duration = platform::Duration;
    using Value = platform::Value;

public:
    static constexpr std::string_view archiveClassName = "VRXWarranty";

    // The record of a coverage dictionary; null when the value is not a dictionary. Every dictionary makes a record: a
    // date or an object of an unexpected type reads as null. The serial number is not kept, because a record that is
    // built from a cache file or an archive could not know it.
    static std::shared_ptr<VRXWarranty> warrantyWithDictionary(const Value& dictionary);
    static std::shared_ptr<VRXWarranty> warrantyWithDictionary(const Value& dictionary,
                                                               const std::optional<std::string>& serialNumber);
    static std::shared_ptr<VRXWarranty> initWithDictionary(const Value& dictionary);
    static std::shared_ptr<VRXWarranty> initWithDictionary(const Value& dictionary,
                                                           const std::optional<std::string>& serialNumber);

    // The whole dictionary, as the server sent it: what is cached, archived, compared and described.
    Value dictionaryRepresentation() const { return get(&Fields::dictionaryRepresentation); }
    void setDictionaryRepresentation(Value value) { set(&Fields::dictionaryRepresentation, std::move(value)); }

    // Texts, lists and objects are as the server sent them, whatever their type; null when it sent none.

    // The coverage.
    bool covered() const { return get(&Fields::covered); }
    void setCovered(bool value) { set(&Fields::covered, value); }
    std::optional<Date> coverageEndDate() const { return get(&Fields::coverageEndDate); }
    void setCoverageEndDate(std::optional<Date> value) { set(&Fields::coverageEndDate, std::move(value)); }
    // The agent never fills this field, nor localizedCoverageDetailsLabel, localizedCoverageDetailsValue,
    // localizedBenefitLabelKey and localizedBenefitValueKey below.
    std::optional<Date> coverageValidityDate() const { return get(&Fields::coverageValidityDate); }
    void setCoverageValidityDate(std::optional<Date> value) { set(&Fields::coverageValidityDate, std::move(value)); }
    Value localizedCoveredDeviceDateLabelFormat() const { return get(&Fields::localizedCoveredDeviceDateLabelFormat); }
    void setLocalizedCoveredDeviceDateLabelFormat(Value value) {
        set(&Fields::localizedCoveredDeviceDateLabelFormat, std::move(value));
    }
    Value coverageLocalizedLabel() const { return get(&Fields::coverageLocalizedLabel); }
    void setCoverageLocalizedLabel(Value value) { set(&Fields::coverageLocalizedLabel, std::move(value)); }
    Value coverageLocalizedDesc() const { return get(&Fields::coverageLocalizedDesc); }
    void setCoverageLocalizedDesc(Value value) { set(&Fields::coverageLocalizedDesc, std::move(value)); }
    Value coverageLocalizedDescLong() const { return get(&Fields::coverageLocalizedDescLong); }
    void setCoverageLocalizedDescLong(Value value) { set(&Fields::coverageLocalizedDescLong, std::move(value)); }
    Value coverageLocalizedExpirationLabel() const { return get(&Fields::coverageLocalizedExpirationLabel); }
    void setCoverageLocalizedExpirationLabel(Value value) {
        set(&Fields::coverageLocalizedExpirationLabel, std::move(value));
    }

    // Footers.
    Value footer1FormatString() const { return get(&Fields::footer1FormatString); }
    void setFooter1FormatString(Value value) { set(&Fields::footer1FormatString, std::move(value)); }
    Value footer1LinkLabel() const { return get(&Fields::footer1LinkLabel); }
    void setFooter1LinkLabel(Value value) { set(&Fields::footer1LinkLabel, std::move(value)); }
    Value footer1LinkURL() const { return get(&Fields::footer1LinkURL); }
    void setFooter1LinkURL(Value value) { set(&Fields::footer1LinkURL, std::move(value)); }
    Value footer2FormatString() const { return get(&Fields::footer2FormatString); }
    void setFooter2FormatString(Value value) { set(&Fields::footer2FormatString, std::move(value)); }
    Value footer2LinkLabel() const { return get(&Fields::footer2LinkLabel); }
    void setFooter2LinkLabel(Value value) { set(&Fields::footer2LinkLabel, std::move(value)); }
    Value footer2LinkURL() const { return get(&Fields::footer2LinkURL); }
    void setFooter2LinkURL(Value value) { set(&Fields::footer2LinkURL, std::move(value)); }

    // The offer of the extended plan.
    bool qxOfferEligible() const { return get(&Fields::qxOfferEligible); }
    void setQxOfferEligible(bool value) { set(&Fields::qxOfferEligible, value); }
    std::optional<Date> qxOfferEligibleUntil() const { return get(&Fields::qxOfferEligibleUntil); }
    void setQxOfferEligibleUntil(std::optional<Date> value) { set(&Fields::qxOfferEligibleUntil, std::move(value)); }
    std::optional<Date> qxOfferFollowupDisplayDate() const { return get(&Fields::qxOfferFollowupDisplayDate); }
    void setQxOfferFollowupDisplayDate(std::optional<Date> value) {
        set(&Fields::qxOfferFollowupDisplayDate, std::move(value));
    }
    std::optional<Date> qxOfferDisplayDate() const { return get(&Fields::qxOfferDisplayDate); }
    void setQxOfferDisplayDate(std::optional<Date> value) { set(&Fields::qxOfferDisplayDate, std::move(value)); }
    Value qxOfferIdentifier() const { return get(&Fields::qxOfferIdentifier); }
    void setQxOfferIdentifier(Value value) { set(&Fields::qxOfferIdentifier, std::move(value)); }
    Value qxLocalizedOfferLabel() const { return get(&Fields::qxLocalizedOfferLabel); }
    void setQxLocalizedOfferLabel(Value value) { set(&Fields::qxLocalizedOfferLabel, std::move(value)); }
    Value qxLocalizedOfferPluralDescFormat() const { return get(&Fields::qxLocalizedOfferPluralDescFormat); }
    void setQxLocalizedOfferPluralDescFormat(Value value) {
        set(&Fields::qxLocalizedOfferPluralDescFormat, std::move(value));
    }
    Value qxLocalizedOfferSingularDesc() const { return get(&Fields::qxLocalizedOfferSingularDesc); }
    void setQxLocalizedOfferSingularDesc(Value value) { set(&Fields::qxLocalizedOfferSingularDesc, std::move(value)); }
    Value qxLocalizedOfferCTA() const { return get(&Fields::qxLocalizedOfferCTA); }
    void setQxLocalizedOfferCTA(Value value) { set(&Fields::qxLocalizedOfferCTA, std::move(value)); }
    Value qxLocalizedOfferDetails() const { return get(&Fields::qxLocalizedOfferDetails); }
    void setQxLocalizedOfferDetails(Value value) { set(&Fields::qxLocalizedOfferDetails, std::move(value)); }
    Value qxLocalizedOfferDetailsPluralEligibilityFormat() const {
        return get(&Fields::qxLocalizedOfferDetailsPluralEligibilityFormat);
    }
    void setQxLocalizedOfferDetailsPluralEligibilityFormat(Value value) {
        set(&Fields::qxLocalizedOfferDetailsPluralEligibilityFormat, std::move(value));
    }
    Value qxLocalizedOfferDetailsSingularEligibility() const {
        return get(&Fields::qxLocalizedOfferDetailsSingularEligibility);
    }
    void setQxLocalizedOfferDetailsSingularEligibility(Value value) {
        set(&Fields::qxLocalizedOfferDetailsSingularEligibility, std::move(value));
    }

    // The toggles of the offer.
    bool qxOfferDisplay() const { return get(&Fields::qxOfferDisplay); }
    void setQxOfferDisplay(bool value) { set(&Fields::qxOfferDisplay, value); }
    bool qxOfferSettingsAppBadge() const { return get(&Fields::qxOfferSettingsAppBadge); }
    void setQxOfferSettingsAppBadge(bool value) { set(&Fields::qxOfferSettingsAppBadge, value); }
    bool qxOfferSettingsRowBadge() const { return get(&Fields::qxOfferSettingsRowBadge); }
    void setQxOfferSettingsRowBadge(bool value) { set(&Fields::qxOfferSettingsRowBadge, value); }
    Duration qxOfferDurationBeforeEndDate() const { return get(&Fields::qxOfferDurationBeforeEndDate); }
    void setQxOfferDurationBeforeEndDate(Duration value) {
        set(&Fields::qxOfferDurationBeforeEndDate, std::move(value));
    }
    Value qxOfferToggle() const { return get(&Fields::qxOfferToggle); }
    void setQxOfferToggle(Value value) { set(&Fields::qxOfferToggle, std::move(value)); }
    Duration qxOfferBadgeDurationBeforeEndDate() const { return get(&Fields::qxOfferBadgeDurationBeforeEndDate); }
    void setQxOfferBadgeDurationBeforeEndDate(Duration value) {
        set(&Fields::qxOfferBadgeDurationBeforeEndDate, std::move(value));
    }

    // The plan in force.
    bool coverageHasQXLogo() const { return get(&Fields::coverageHasQXLogo); }
    void setCoverageHasQXLogo(bool value) { set(&Fields::coverageHasQXLogo, value); }
    Value localizedCoverageSubTitleForServicesPartnerString() const {
        return get(&Fields::localizedCoverageSubTitleForServicesPartnerString);
    }
    void setLocalizedCoverageSubTitleForServicesPartnerString(Value value) {
        set(&Fields::localizedCoverageSubTitleForServicesPartnerString, std::move(value));
    }
    Value localizedCoverageFooterFormatString() const { return get(&Fields::localizedCoverageFooterFormatString); }
    void setLocalizedCoverageFooterFormatString(Value value) {
        set(&Fields::localizedCoverageFooterFormatString, std::move(value));
    }
    Value localizedCoverageFooterLinkLabel() const { return get(&Fields::localizedCoverageFooterLinkLabel); }
    void setLocalizedCoverageFooterLinkLabel(Value value) {
        set(&Fields::localizedCoverageFooterLinkLabel, std::move(value));
    }
    Value localizedSupportAppLabel() const { return get(&Fields::localizedSupportAppLabel); }
    void setLocalizedSupportAppLabel(Value value) { set(&Fields::localizedSupportAppLabel, std::move(value)); }
    bool isCoveragePlanSubscriptionType() const { return get(&Fields::isCoveragePlanSubscriptionType); }
    void setIsCoveragePlanSubscriptionType(bool value) { set(&Fields::isCoveragePlanSubscriptionType, value); }
    Value localizedManagePlanLabel() const { return get(&Fields::localizedManagePlanLabel); }
    void setLocalizedManagePlanLabel(Value value) { set(&Fields::localizedManagePlanLabel, std::move(value)); }
    Value qxOfferBadgeDaysBeforeEndDate() const { return get(&Fields::qxOfferBadgeDaysBeforeEndDate); }
    void setQxOfferBadgeDaysBeforeEndDate(Value value) {
        set(&Fields::qxOfferBadgeDaysBeforeEndDate, std::move(value));
    }
    bool isQXServicesPartner() const { return get(&Fields::isQXServicesPartner); }
    void setIsQXServicesPartner(bool value) { set(&Fields::isQXServicesPartner, value); }

    // The coverage in detail, with its benefits.
    Value coverageDetailsDictionary() const { return get(&Fields::coverageDetailsDictionary); }
    void setCoverageDetailsDictionary(Value value) { set(&Fields::coverageDetailsDictionary, std::move(value)); }
    Value localizedCoverageDetailsTitle() const { return get(&Fields::localizedCoverageDetailsTitle); }
    void setLocalizedCoverageDetailsTitle(Value value) {
        set(&Fields::localizedCoverageDetailsTitle, std::move(value));
    }
    Value coverageDetailsArray() const { return get(&Fields::coverageDetailsArray); }
    void setCoverageDetailsArray(Value value) { set(&Fields::coverageDetailsArray, std::move(value)); }
    Value localizedCoverageDetailsLabel() const { return get(&Fields::localizedCoverageDetailsLabel); }
    void setLocalizedCoverageDetailsLabel(Value value) {
        set(&Fields::localizedCoverageDetailsLabel, std::move(value));
    }
    Value localizedCoverageDetailsValue() const { return get(&Fields::localizedCoverageDetailsValue); }
    void setLocalizedCoverageDetailsValue(Value value) {
        set(&Fields::localizedCoverageDetailsValue, std::move(value));
    }
    Value coverageBenefitsDictionary() const { return get(&Fields::coverageBenefitsDictionary); }
    void setCoverageBenefitsDictionary(Value value) { set(&Fields::coverageBenefitsDictionary, std::move(value)); }
    Value localizedBenefitsCardTitle() const { return get(&Fields::localizedBenefitsCardTitle); }
    void setLocalizedBenefitsCardTitle(Value value) { set(&Fields::localizedBenefitsCardTitle, std::move(value)); }
    Value localizedBenefitsCardSubTitle() const { return get(&Fields::localizedBenefitsCardSubTitle); }
    void setLocalizedBenefitsCardSubTitle(Value value) {
        set(&Fields::localizedBenefitsCardSubTitle, std::move(value));
    }
    Value benefitDetailsArray() const { return get(&Fields::benefitDetailsArray); }
    void setBenefitDetailsArray(Value value) { set(&Fields::benefitDetailsArray, std::move(value)); }
    Value localizedBenefitLabelKey() const { return get(&Fields::localizedBenefitLabelKey); }
    void setLocalizedBenefitLabelKey(Value value) { set(&Fields::localizedBenefitLabelKey, std::move(value)); }
    Value localizedBenefitValueKey() const { return get(&Fields::localizedBenefitValueKey); }
    void setLocalizedBenefitValueKey(Value value) { set(&Fields::localizedBenefitValueKey, std::move(value)); }
    Value localizedBenefitsCardFooter() const { return get(&Fields::localizedBenefitsCardFooter); }
    void setLocalizedBenefitsCardFooter(Value value) { set(&Fields::localizedBenefitsCardFooter, std::move(value)); }

    // Links, and the rest.
    bool displayRepairAndSupport() const { return get(&Fields::displayRepairAndSupport); }
    void setDisplayRepairAndSupport(bool value) { set(&Fields::displayRepairAndSupport, value); }
    Value kelURL() const { return get(&Fields::kelURL); }
    void setKelURL(Value value) { set(&Fields::kelURL, std::move(value)); }
    Value supportAppURL() const { return get(&Fields::supportAppURL); }
    void setSupportAppURL(Value value) { set(&Fields::supportAppURL, std::move(value)); }
    Value serialNumber() const { return get(&Fields::serialNumber); }
    void setSerialNumber(Value value) { set(&Fields::serialNumber, std::move(value)); }

    // Whole days until the offer ends, rounded up: 1 in its last 24 hours, 0 once it has ended or when it has no end.
    std::uint32_t daysEligible() const;
    // The same for an offer that ends at a date, counted from now. A day of 0 seconds or less counts as 86400.
    static std::uint32_t daysEligible(const std::optional<Date>& until, Duration day, Date now);
    // The texts that name those days: the server's singular text for at most one day, else its plural format, filled
    // with the number in the user's locale. Null when the format is not a string.
    Value qxLocalizedOfferDesc() const;
    Value qxLocalizedOfferDetailsEligibility() const;

    // The date that lies so many seconds after 1970 or, above ten thousand million, so many milliseconds. Null when the
    // value is not a number, is negative or is not finite.
    static std::optional<Date> _dateWithEpochNumber(const Value& number);

    // Whether the dictionaries are equal. An object of another class is never equal.
    bool isEqual(const platform::Archivable* other) const;
    std::string description() const { return dictionaryRepresentation().description(); }

    static constexpr bool supportsSecureCoding = true;
    std::string_view className() const override { return archiveClassName; }
    void encodeWithCoder(platform::KeyedEncoder& coder) const override;
    static std::shared_ptr<VRXWarranty> initWithCoder(platform::KeyedDecoder& coder);

    // The cache of records on disk: a file for each serial number or, without a serial number, the one file of the
    // older single-device layout. No operation reports a failure: a failed write keeps the earlier file, and a file
    // that cannot be read reads as null.
    // These need facilities that only the agent has, so they are defined in the agent's own layer
    // (coverage/warranty_cache.cpp): a client program that calls one of them does not link.
    static std::string _legacyWarrantyPath();
    static std::string _warrantyPathForSerialNumberFormat();  // with a "%@" for the serial number's hash
    void cacheWarranty(const std::optional<std::string>& serialNumber) const;
    void cache() const { cacheWarranty(std::nullopt); }
    static std::shared_ptr<VRXWarranty> cachedWarrantyForSerialNumber(const std::optional<std::string>& serialNumber);
    // Moves the file and metadata of the older layout to the serial number and returns the record. Returns null and
    // changes nothing when there is no such record or no serial number to move it to.
    static std::shared_ptr<VRXWarranty> migrateLegacyCachedWarrantyIfNeededForSerialNumber(
        const std::optional<std::string>& serialNumber);

    // The fields by the names of their properties; public for the table in warranty.cpp.
    struct Fields {
        bool covered = false;
        std::optional<Date> coverageEndDate;
        std::optional<Date> coverageValidityDate;
        Value localizedCoveredDeviceDateLabelFormat;
        Value coverageLocalizedLabel;
        Value coverageLocalizedDesc;
        Value coverageLocalizedDescLong;
        Value coverageLocalizedExpirationLabel;
        Value footer1FormatString;
        Value footer1LinkLabel;
        Value footer1LinkURL;
        Value footer2FormatString;
        Value footer2LinkLabel;
        Value footer2LinkURL;
        bool qxOfferEligible = false;
        std::optional<Date> qxOfferEligibleUntil;
        std::optional<Date> qxOfferFollowupDisplayDate;
        std::optional<Date> qxOfferDisplayDate;
        Value qxOfferIdentifier;
        Value qxLocalizedOfferLabel;
        Value qxLocalizedOfferPluralDescFormat;
        Value qxLocalizedOfferSingularDesc;
        Value qxLocalizedOfferCTA;
        Value qxLocalizedOfferDetails;
        Value qxLocalizedOfferDetailsPluralEligibilityFormat;
        Value qxLocalizedOfferDetailsSingularEligibility;
        bool qxOfferDisplay = false;
        bool qxOfferSettingsAppBadge = false;
        bool qxOfferSettingsRowBadge = false;
        Duration qxOfferDurationBeforeEndDate{};
        Value qxOfferToggle;
        Duration qxOfferBadgeDurationBeforeEndDate{};
        bool coverageHasQXLogo = false;
        Value localizedCoverageSubTitleForServicesPartnerString;
        Value localizedCoverageFooterFormatString;
        Value localizedCoverageFooterLinkLabel;
        Value localizedSupportAppLabel;
        bool isCoveragePlanSubscriptionType = false;
        Value localizedManagePlanLabel;
        Value qxOfferBadgeDaysBeforeEndDate;
        bool isQXServicesPartner = false;
        Value coverageDetailsDictionary;
        Value localizedCoverageDetailsTitle;
        Value coverageDetailsArray;
        Value localizedCoverageDetailsLabel;
        Value localizedCoverageDetailsValue;
        Value coverageBenefitsDictionary;
        Value localizedBenefitsCardTitle;
        Value localizedBenefitsCardSubTitle;
        Value benefitDetailsArray;
        Value localizedBenefitLabelKey;
        Value localizedBenefitValueKey;
        Value localizedBenefitsCardFooter;
        bool displayRepairAndSupport = false;
        Value kelURL;
        Value supportAppURL;
        Value dictionaryRepresentation;
        Value serialNumber;
    };

private:
    explicit VRXWarranty(Fields fields) : fields_(std::move(fields)) {}

    template <class T>
    T get(T Fields::*field) const {
        std::lock_guard lock(mutex_);
        return fields_.*field;
    }
    template <class T>
    void set(T Fields::*field, T value) {
        std::lock_guard lock(mutex_);
        fields_.*field = std::move(value);
    }
    Value textForDaysEligible(const Value& singular, const Value& pluralFormat, void (*reportFormat)()) const;

    mutable std::mutex mutex_;
    Fields fields_;
};

}  // namespace vrx
