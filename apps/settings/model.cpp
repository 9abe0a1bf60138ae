#include "settings/model.h"

#include <algorithm>

#include "vrx/devices/records/device_info.h"

namespace vrx::settings {

using client::FollowUp;
using platform::Array;
using platform::Dictionary;
using platform::Value;

namespace {

constexpr std::string_view placeholder = "%@";

std::string textOf(const Value& sent) {
    const std::string* text = sent.asString();
    return text ? *text : "";
}

std::string firstOf(std::string first, std::string second) {
    return first.empty() ? second : first;
}

// The server chooses the keys; they end in Label and Value. A plain text is a line as well.
Entry entryOf(const Value& sent) {
    Entry entry;
    if (const std::string* text = sent.asString()) entry.label = *text;
    if (const Dictionary* parts = sent.asDictionary())
        for (const auto& [key, part] : *parts) {
            if (key.ends_with("Label")) entry.label = textOf(part);
            if (key.ends_with("Value")) entry.value = textOf(part);
        }
    return entry;
}

std::vector<Entry> entriesOf(const Value& sent) {
    std::vector<Entry> entries;
    if (const Array* list = sent.asArray())
        for (const Value& element : *list)
            if (Entry entry = entryOf(element); entry != Entry{}) entries.push_back(std::move(entry));
    return entries;
}

Footer footerOf(const Value& format, const Value& label, const Value& address) {
    Footer footer{.before = textOf(format), .label = textOf(label), .address = browserAddress(textOf(address))};
    if (const std::size_t place = footer.before.find(placeholder); place != std::string::npos) {
        footer.after = footer.before.substr(place + placeholder.size());
        footer.before.resize(place);
    } else if (!footer.before.empty() && !footer.label.empty()) {
        footer.before += ' ';
    }
    return footer;
}

OfferDetails offerDetailsOf(const VRXWarranty& record) {
    if (!record.qxOfferEligible()) return {};
    return {.label = textOf(record.qxLocalizedOfferLabel()),
            .text = textOf(record.qxLocalizedOfferDesc()),
            .period = textOf(record.qxLocalizedOfferDetailsEligibility()),
            .details = textOf(record.qxLocalizedOfferDetails())};
}

Record recordOf(const VRXWarranty& record) {
    Record shown{
        .isCovered = record.covered(),
        .endDate = record.coverageEndDate(),
        .label = textOf(record.coverageLocalizedLabel()),
        .description = firstOf(textOf(record.coverageLocalizedDescLong()), textOf(record.coverageLocalizedDesc())),
        .partner = textOf(record.localizedCoverageSubTitleForServicesPartnerString()),
        .expirationLabel = textOf(record.coverageLocalizedExpirationLabel()),
        .endDateFormat = textOf(record.localizedCoveredDeviceDateLabelFormat()),
        .detailsTitle = textOf(record.localizedCoverageDetailsTitle()),
        .details = entriesOf(record.coverageDetailsArray()),
        .detailsFooter =
            footerOf(record.localizedCoverageFooterFormatString(), record.localizedCoverageFooterLinkLabel(), Value()),
        .benefitsTitle = textOf(record.localizedBenefitsCardTitle()),
        .benefitsSubtitle = textOf(record.localizedBenefitsCardSubTitle()),
        .benefitsFooter = textOf(record.localizedBenefitsCardFooter()),
        .benefits = entriesOf(record.benefitDetailsArray()),
        .offer = offerDetailsOf(record),
        .offersSupport = record.displayRepairAndSupport(),
        .supportLabel = textOf(record.localizedSupportAppLabel()),
        .supportAddress = browserAddress(textOf(record.supportAppURL())),
        .agreementsAddress = browserAddress(textOf(record.kelURL()))};
    for (Footer& footer :
         std::vector{footerOf(record.footer1FormatString(), record.footer1LinkLabel(), record.footer1LinkURL()),
                     footerOf(record.footer2FormatString(), record.footer2LinkLabel(), record.footer2LinkURL())})
        if (!footer.isEmpty()) shown.footers.push_back(footer);
    return shown;
}

Device deviceOf(const VRXDeviceInfo& info) {
    Device device;
    if (const auto known = info.device()) {
        device = {.serialNumber = known->serialNumber().value_or(""),
                  .name = known->name().value_or(""),
                  .isWatch = known->deviceType() != VRXDeviceTypeDefault};
    }
    if (const auto record = info.warranty()) device.record = recordOf(*record);
    return device;
}

// The agent gives them in the order in which it had their records.
std::vector<Device> devicesOf(const DeviceInfoList& infos, const DeviceList& paired) {
    std::vector<Device> devices;
    for (const auto& info : infos)
        if (info) devices.push_back(deviceOf(*info));
    const auto place = [&](const Device& device) {
        const auto isIt = [&](const auto& watch) { return watch && watch->serialNumber() == device.serialNumber; };
        return std::pair(device.isWatch ? 1 + (std::ranges::find_if(paired, isIt) - paired.begin()) : 0,
                         device.serialNumber);
    };
    std::ranges::sort(devices, {}, place);
    return devices;
}

Offer offerOf(const FollowUp& followUp) {
    Offer offer{.identifier = followUp.identifier,
                .serialNumber = followUp.serialNumber.value_or(""),
                .title = followUp.title.value_or(""),
                .text = followUp.text.value_or(""),
                .hasBadge = followUp.hasBadge};
    for (const client::FollowUpAction& action : followUp.actions) {
        OfferAction shown{action.label.value_or(""), browserAddress(action.url.value_or(""))};
        if (!action.url || !shown.address.empty()) offer.actions.push_back(std::move(shown));
    }
    return offer;
}

}  // namespace

Situation situationAfter(const Situation& before, const Findings& findings) {
    Situation after = before;
    after.failure.reset();
    if (findings.followUps) {
        after.offers.clear();
        after.nextTextChange.reset();
        for (const FollowUp& followUp : *findings.followUps) {
            after.offers.push_back(offerOf(followUp));
            if (const auto next = followUp.nextTextChange;
                next && (!after.nextTextChange || *next < *after.nextTextChange))
                after.nextTextChange = next;
        }
    } else {
        after.failure = findings.followUps.failure();
    }
    // An agent that does not say so may well have an account.
    if (findings.status) after.isSignedIn = (*findings.status)["account"].asBool().value_or(true);
    if (findings.infos && findings.paired)
        after.devices = devicesOf(*findings.infos, *findings.paired);
    else
        after.failure = findings.infos ? findings.paired.failure() : findings.infos.failure();
    return after;
}

const Device* deviceWith(const Situation& situation, const std::string& serialNumber) {
    const auto device = std::ranges::find(situation.devices, serialNumber, &Device::serialNumber);
    return device == situation.devices.end() ? nullptr : &*device;
}

std::vector<Offer> offersFor(const Situation& situation, const std::string& serialNumber) {
    std::vector<Offer> offers;
    for (const Offer& offer : situation.offers) {
        const bool isKnown = !offer.serialNumber.empty() && deviceWith(situation, offer.serialNumber);
        if (serialNumber.empty() ? !isKnown : isKnown && offer.serialNumber == serialNumber) offers.push_back(offer);
    }
    return offers;
}

std::string browserAddress(std::string address) {
    const std::size_t scheme = address.find("://");
    if (scheme == std::string::npos || scheme + 3 == address.size()) return {};
    std::string name = address.substr(0, scheme);
    for (char& c : name)
        if (c >= 'A' && c <= 'Z') c = static_cast<char>(c - 'A' + 'a');
    return name == "http" || name == "https" ? address : std::string();
}

}  // namespace vrx::settings
